// radio_get: prints one value.
//
//   radio_get PATH          a property, /radio/registration@area for a part of
//                           its value, or a place in the tree: then the names
//                           there; PATH/* for everything there, * for everything

#include <optional>

#include "examples/show.h"
#include "plr/rest.h"

namespace {

constexpr const char* kService = "net.example.radio";

struct Answers {
    std::optional<vox::object> value;  // nothing: nobody answered for the path
    bool served = false;               // the service is there
};

Answers ask(const std::string& path) {
    const auto queue = dispatch::queue::create("radio_get");
    const plr::RestModule rest(queue, "radio_get");
    const dispatch::group open;
    Answers answers;
    queue.sync([&] {
        rest.connect(vox::connection::create(kService));
        rest.getPropertyOnce(path, [&](const vox::object& value) { answers.value = value; });
        // A path that leads nowhere gets no answer, but the root always answers,
        // and answers come in the order of their questions.
        rest.getPropertyOnce("/", [&, session = dispatch::group_session(open)](
                                      const vox::object& names) { answers.served = bool(names); });
    });
    static_cast<void>(open.wait());
    return answers;
}

}  // namespace

int main(int argc, char** argv) {
    if (argc != 2) {
        std::cerr << "usage: radio_get PATH\n";
        return 2;
    }
    const Answers answers = ask(argv[1]);
    if (!answers.served) {
        std::cerr << "radio_get: " << kService << " is not there\n";
        return 1;
    }
    if (!answers.value) {
        std::cerr << "radio_get: there is nothing at " << argv[1] << '\n';
        return 1;
    }
    radio::say(answers.value->to_string());
}
