// radio_send: sends a text as a short message, or as several.
//
//   radio_send [--print] [--language LANGUAGE]... NUMBER TEXT
//
//   --print      says what would be sent, and does not
//   --language   Turkish, Spanish or Portuguese: the receiver knows its tables
//
// The text is encoded here; the service has the modem send its PDUs.

#include <chrono>
#include <optional>
#include <random>
#include <string>
#include <vector>

#include "examples/radio_settings.h"
#include "examples/show.h"
#include "examples/sms_pdu.h"
#include "plr/format/hex.h"
#include "plr/ipc.h"
#include "plr/rest.h"
#include "plr/text/sms_encoding.h"

namespace {

using Language = plr::TextConverter::NationalLanguageId;
struct Options {
    bool print = false;
    std::vector<Language> languages;
    std::string number, text;
};

std::optional<Language> languageOf(const std::string& name) {
    for (const auto language : {Language::kTurkish, Language::kSpanish, Language::kPortuguese})
        if (name == asString(language))
            return language;
    return std::nullopt;
}

std::optional<Options> parse(const std::vector<std::string>& words) {
    Options options;
    std::size_t i = 0;
    for (; i < words.size() && words[i].starts_with("--"); ++i) {
        const bool takesName = words[i] == "--language" && i + 1 < words.size();
        if (words[i] == "--print")
            options.print = true;
        else if (const auto language = takesName ? languageOf(words[++i]) : std::nullopt)
            options.languages.push_back(*language);
        else
            return std::nullopt;
    }
    if (words.size() != i + 2)
        return std::nullopt;
    options.number = words[i];
    options.text = words.back();
    return options;
}

// In hex; none where the number is none, or the text too long.
std::vector<std::string> pdusOf(const Options& options) {
    const auto encoding = plr::chooseSmsEncoding(options.text, options.languages);
    const auto size = plr::measureSms(options.text, encoding);
    radio::say(std::string(asString(encoding.encoding)) + ", locking " +
               asString(encoding.locking) + ", single " + asString(encoding.single) +
               "; parts: " + std::to_string(size.parts) + ", units: " + std::to_string(size.units) +
               ", left: " + std::to_string(size.unitsLeft));
    std::vector<std::string> pdus;
    const auto number = static_cast<std::uint16_t>(std::random_device()());
    const auto parts = plr::encodeSms(options.text, encoding, plr::SmsReference::k8Bit, number);
    for (const plr::SmsPart& part : parts)
        if (const auto pdu = radio::writeSubmit(options.number, part))
            pdus.push_back(plr::hex(*pdu));
    return pdus;
}

plr::Result<vox::object> request(const std::vector<std::string>& pdus) {
    const auto value = vox::array::create();
    for (const std::string& pdu : pdus)
        value.append(vox::string(pdu));
    const auto queue = dispatch::queue::create("radio_send");
    const plr::RestModule rest(queue, "radio_send");
    const dispatch::group open;
    plr::Result<vox::object> answer;
    queue.sync([&] {
        rest.connect(vox::connection::create(radio::serviceName().c_str()));
        rest.sendRequest("/requests/send_sms", value, std::chrono::minutes(pdus.size()),
                         [&, session = dispatch::group_session(open)](
                             const plr::Result<vox::object>& result) { answer = result; });
    });
    static_cast<void>(open.wait());
    return answer;
}

int fail(const std::string& why) {
    std::cerr << "radio_send: " << why << '\n';
    return 1;
}

}  // namespace

int main(int argc, char** argv) {
    const auto options = parse({argv + 1, argv + argc});
    if (!options) {
        std::cerr << "usage: radio_send [--print] [--language LANGUAGE]... NUMBER TEXT\n";
        return 2;
    }
    const auto pdus = pdusOf(*options);
    if (pdus.empty())
        return fail("no number, or a text of too many parts");
    if (options->print) {
        std::ranges::for_each(pdus, radio::say);
        return 0;
    }
    const auto answer = request(pdus);
    if (!answer)
        return fail(answer.error().to_string());
    radio::say(answer.value().to_string());
    return answer.value().text() == "OK" ? 0 : 1;
}
