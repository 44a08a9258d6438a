// radio_get: prints one value, or the answer to a request.
//
//   radio_get PATH          a property, /radio/registration@area for a part of
//                           its value, or a place in the tree: then the names
//                           there; PATH/* for everything there, * for everything;
//                           /descriptions for what there is
//   radio_get PATH VALUE    asks with the value: true, false, null, an integer, else
//                           a string, in quotes where it is to be one:
//                           /requests/enter_pin '"1234"'

#include <chrono>
#include <optional>

#include "examples/radio_settings.h"
#include "examples/show.h"
#include "plr/ipc.h"
#include "plr/rest.h"

namespace {

struct Answers {
    std::optional<vox::object> value;  // nothing: nobody answered for the path
    bool served = false;               // the service is there
};

Answers get(const std::string& path) {
    const auto queue = dispatch::queue::create("radio_get");
    const plr::RestModule rest(queue, "radio_get");
    const dispatch::group open;
    Answers answers;
    queue.sync([&] {
        rest.connect(vox::connection::create(radio::serviceName().c_str()));
        rest.getPropertyOnce(path, [&](const vox::object& value) { answers.value = value; });
        // A path that leads nowhere gets no answer, but the root always answers,
        // and answers come in the order of their questions.
        rest.getPropertyOnce("/", [&, session = dispatch::group_session(open)](
                                      const vox::object& names) { answers.served = bool(names); });
    });
    static_cast<void>(open.wait());
    return answers;
}

plr::Result<vox::object> request(const std::string& path, const vox::object& value) {
    const auto queue = dispatch::queue::create("radio_get");
    const plr::RestModule rest(queue, "radio_get");
    const dispatch::group open;
    plr::Result<vox::object> answer;
    queue.sync([&] {
        rest.connect(vox::connection::create(radio::serviceName().c_str()));
        rest.sendRequest(path, value, std::chrono::seconds(10),
                         [&, session = dispatch::group_session(open)](
                             const plr::Result<vox::object>& result) { answer = result; });
    });
    static_cast<void>(open.wait());
    return answer;
}

// A path, its type and what it is for on a line each.
void sayDescriptions(const vox::dict& descriptions) {
    for (std::size_t i = 0; i < descriptions.count(); i++) {
        const char* path = nullptr;
        const vox::dict description(
            vox::object::retain(vox_dictionary_get_entry(descriptions.get(), i, &path)));
        std::string line = path;
        line.resize(std::max<std::size_t>(line.size() + 1, 28), ' ');
        line += description.text("type");
        line.resize(std::max<std::size_t>(line.size() + 1, 40), ' ');
        radio::say(line.append(description.text("doc")));
    }
}

int fail(const std::string& why) {
    std::cerr << "radio_get: " << why << '\n';
    return 1;
}

}  // namespace

int main(int argc, char** argv) {
    if (argc != 2 && argc != 3) {
        std::cerr << "usage: radio_get PATH [VALUE]\n";
        return 2;
    }
    const std::string path = argv[1];
    if (argc == 3) {
        const auto answer = request(path, radio::valueOf(argv[2]));
        if (!answer)
            return fail(path + ": " + answer.error().to_string());
        radio::say(answer.value().to_string());
        return 0;
    }
    const Answers answers = get(path);
    if (!answers.served)
        return fail(radio::serviceName() + " is not there");
    if (!answers.value)
        return fail("there is nothing at " + path);
    if (const vox::dict found(*answers.value); path.starts_with("/descriptions") && found)
        sayDescriptions(found);
    else
        radio::say(answers.value->to_string());
    return 0;
}
