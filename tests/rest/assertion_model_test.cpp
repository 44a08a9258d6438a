#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cstdint>
#include <functional>
#include <map>
#include <random>
#include <set>
#include <tuple>

#include "plr/test/fake_rest.h"
#include "support/sanitized.h"

// Random clients and providers against a model of assertions: after every step the
// document of what it touched, and what every connection was told by it, are equal.
namespace {

using namespace plr::test;
using namespace plr::rest;
using enum Operation;

constexpr unsigned kSeed = 20240517;
constexpr int kSteps = kSanitized ? 50'000 : 1'000'000;
constexpr int kClients = 20;
constexpr int kNobody = -1;
constexpr std::array kNames = {"a", "b", "c", "d", "e"};
// "e" passes the last generation after this many.
constexpr std::uint32_t kGenerationsBeforeLast = 20;

// What a connection is told: its number, which is its name; path; generation;
// state.
using Told = std::tuple<int, std::string, std::uint64_t, std::string>;

// Clients are connections: one that comes back is another.
struct Model {
    struct Assertion {
        std::uint64_t round = 0;  // ended generations
        std::set<int> waiting, holding, lost;
        int provider = kNobody;

        [[nodiscard]] std::uint64_t generation() const { return 1 + round % 4294967295; }
        [[nodiscard]] std::string standing() const {
            return !waiting.empty() ? "1:kPending" : holding.empty() ? "0:kIdle" : "2:kGranted";
        }
    };
    const bool holdOff;
    const bool providerOnly;
    std::map<std::string, Assertion> assertions = {};
    std::vector<Told> told = {};  // by the last step

    void tell(const std::string& name, int client, const char* state) {
        told.emplace_back(client, "/at/" + name, assertions[name].generation(), state);
    }
    void tellProvider(const std::string& name) {
        const Assertion& assertion = assertions[name];
        if (assertion.provider != kNobody)
            told.emplace_back(assertion.provider, "/at/" + name + "/provider",
                              assertion.generation(), assertion.standing());
    }
    void assertBy(const std::string& name, int client) {
        Assertion& assertion = assertions[name];
        if (client == kNobody)
            return;
        assertion.lost.erase(client);
        const bool isIdle = assertion.waiting.empty() && assertion.holding.empty();
        if (holdOff || assertion.holding.empty())
            assertion.waiting.insert(client);
        else if (assertion.holding.insert(client).second)
            tell(name, client, "2:kGranted");
        if (isIdle)
            tellProvider(name);
    }
    void releaseBy(const std::string& name, int client) {
        const auto found = assertions.find(name);
        if (found == assertions.end())
            return;
        Assertion& assertion = found->second;
        assertion.lost.erase(client);
        std::set<int>& left =
            assertion.holding.count(client) != 0 ? assertion.holding : assertion.waiting;
        if (left.erase(client) != 0 && left.empty())
            endGeneration(name);
    }
    void endGeneration(const std::string& name) {
        Assertion& assertion = assertions[name];
        if (!holdOff)
            for (; !assertion.holding.empty(); assertion.holding.erase(assertion.holding.begin())) {
                assertion.lost.insert(*assertion.holding.begin());
                tell(name, *assertion.holding.begin(), "0:kIdle");
            }
        ++assertion.round;
        tellProvider(name);
    }
    // Whether an answer counts.
    bool heeds(const std::string& name, int client, std::uint64_t generation) {
        return assertions.count(name) != 0 && assertions[name].generation() == generation &&
               (!providerOnly || (client != kNobody && client == assertions[name].provider));
    }
    void grantBy(const std::string& name, int client, std::uint64_t generation) {
        if (!heeds(name, client, generation))
            return;
        for (const int waiter : std::exchange(assertions[name].waiting, {}))
            if (assertions[name].holding.insert(waiter).second)
                tell(name, waiter, "2:kGranted");
        tellProvider(name);
    }
    void revokeBy(const std::string& name, int client, std::uint64_t generation) {
        if (heeds(name, client, generation))
            endGeneration(name);
    }
    void registerBy(const std::string& name, int client) {
        Assertion& assertion = assertions[name];
        if (client == kNobody)
            return;
        assertion.provider = client;
        tellProvider(name);
    }
    void unregisterBy(const std::string& name, int client) {
        if (client != kNobody && assertions.count(name) != 0 && assertions[name].provider == client)
            assertions[name].provider = kNobody;
    }
    void drop(int client) {
        for (auto& [name, assertion] : assertions) {
            const bool waited = assertion.waiting.erase(client) != 0;
            const bool held = assertion.holding.erase(client) != 0;
            assertion.lost.erase(client);
            if (assertion.provider == client)
                assertion.provider = kNobody;
            if ((waited && assertion.waiting.empty()) || (held && assertion.holding.empty()))
                endGeneration(name);
        }
    }
};

class Assertions : public AssertionRestResource {
  public:
    template <class... Tags>
    explicit Assertions(Tags... tags) : AssertionRestResource(tags...) {}
    using AssertionRestResource::createIfNotPresent;
};

// Notes what is sent, without making messages of it.
class NotingContext : public FakeRestContext {
  public:
    using FakeRestContext::FakeRestContext;
    bool sendNotify(const RestResourceConnection& to, const vox::object& author,
                    const vox::object& resource, const vox::object& value) override {
        const vox::dict state(value);
        isOdd |= author.text() != to.name() || state.count() != 2;
        told.emplace_back(std::stoi(to.name()), resource.text(),
                          vox_int64_get_value(vox::object(state["generation"]).get()),
                          state.text("state"));
        return true;
    }
    std::vector<Told> told;
    bool isOdd = false;
};

// One message, or the end of a client, and what the model makes of it.
struct Step {
    Operation operation;  // kNone: the client's connection ends
    std::string name, word;
    int client;  // a connection's number
    vox::object value;
    std::function<void(Model&)> effect;

    [[nodiscard]] std::string text() const {
        return asString(operation) + (" " + name + word + " by " + std::to_string(client)) + " " +
               oneLine(value);
    }
};

class Walk {
  public:
    Walk(Assertions& resource, Model model) : resource_(resource), model_(std::move(model)) {
        for (int slot = 0; slot < kClients; ++slot)
            connect(slot);
        resource_.createIfNotPresent("e").generation = 4294967295 - kGenerationsBeforeLast;
        model_.assertions["e"].round = 4294967294 - kGenerationsBeforeLast;
    }

    void run(int steps) {
        for (int number = 0; number < steps; ++number) {
            const Step step = choose();
            const std::string difference = play(step);
            ASSERT_TRUE(difference.empty())
                << "seed " << kSeed << ", step " << number << ": " << step.text() << '\n'
                << difference;
        }
        EXPECT_LT(model_.assertions["e"].generation(), 1'000'000'000) << "it did not wrap";
    }

  private:
    unsigned below(unsigned bound) { return static_cast<unsigned>(random_()) % bound; }

    void connect(int slot) {
        int& number = numbers_[static_cast<std::size_t>(slot)];
        number = ++connections_ * kClients + slot;
        clients_[static_cast<std::size_t>(slot)] =
            std::make_shared<FakeRestConnection>(std::to_string(number));
    }
    [[nodiscard]] std::shared_ptr<RestResourceConnection> connection(int number) const {
        return number == kNobody ? nullptr : clients_[static_cast<std::size_t>(number % kClients)];
    }

    Step choose() {
        const unsigned dice = below(100);
        const std::string name = kNames[below(kNames.size())];
        const int client = below(50) == 0 ? kNobody : numbers_[below(kClients)];
        const auto step = [&](Operation operation, const char* word, auto effect) -> Step {
            return {operation, name, word,
                    client,    {},   [=](Model& model) {
                        (model.*effect)(name, client); }};
        };
        if (dice < 35)
            return step(kPush, "", &Model::assertBy);
        if (dice < 60)
            return step(kPop, "", &Model::releaseBy);
        if (dice < 85)
            return chooseAnswer(dice < 77, name, client);
        if (dice < 93)
            return step(kPush, "/provider", &Model::registerBy);
        if (dice < 96)
            return step(kPop, "/provider", &Model::unregisterBy);
        const int leaving = numbers_[below(kClients)];
        return {kNone, {}, {}, leaving, {}, [=](Model& model) { model.drop(leaving); }};
    }
    // Mostly by the provider and of the current generation.
    Step chooseAnswer(bool grants, const std::string& name, int client) {
        const auto known = model_.assertions.find(name);
        std::uint64_t generation = 1;
        if (known != model_.assertions.end()) {
            client = below(4) == 0 ? client : known->second.provider;
            generation = known->second.generation();
        }
        vox::object value = vox::uint64(generation);
        switch (below(10)) {
            case 0:
                value = vox::uint64(--generation);
                break;
            case 1:
                value = vox::int64(static_cast<std::int64_t>(++generation));
                break;
            case 2:
                value = garbage();
                generation = 0;  // as it reads
                break;
            default:
                break;
        }
        return {kSet, name, grants ? "/granted" : "/revoked", client, value, [=](Model& model) {
                    grants ? model.grantBy(name, client, generation)
                           : model.revokeBy(name, client, generation);
                }};
    }
    vox::object garbage() {
        const vox::object values[] = {{},
                                      vox::string("1"),
                                      vox::real(1),
                                      vox::boolean(true),
                                      vox::int64((1LL << 32) + 1),
                                      vox::dict::create()};
        return values[below(std::size(values))];
    }

    // What differs after a step.
    std::string play(const Step& step) {
        model_.told.clear();
        step.effect(model_);
        const bool isDrop = step.operation == kNone;
        NotingContext context(step.operation, step.value,
                              isDrop ? nullptr : connection(step.client));
        if (isDrop)
            drop(context, step.client);
        else
            send(context, step);
        if (context.isOdd || !context.replies().empty())
            return "an odd notification, or a reply";
        if (!sameTold(context.told, model_.told))
            return "told " + testing::PrintToString(context.told) + " instead of " +
                   testing::PrintToString(model_.told);
        return isDrop ? differenceOfAll() : differenceOf(step.name);
    }
    void send(NotingContext& context, const Step& step) {
        const std::string path = "/at/" + step.name + step.word;
        PathView view(path);
        view.advance(1);
        context.isOdd |= !resource_.handleMessage(context, view);
    }
    // What is sent to a connection that has ended is heard by nobody.
    void drop(NotingContext& context, int client) {
        resource_.handleDroppedConnection(context, PathView("/at"), connection(client));
        std::erase_if(context.told,
                      [client](const Told& told) { return std::get<0>(told) == client; });
        connect(client % kClients);
    }

    // Each connection's own order counts.
    static bool sameTold(std::vector<Told> left, std::vector<Told> right) {
        const auto number = [](const Told& told) { return std::get<0>(told); };
        std::ranges::stable_sort(left, {}, number);
        std::ranges::stable_sort(right, {}, number);
        return left == right;
    }

    vox::object get(const std::string& path) {
        NotingContext context(kGet);
        PathView view(path);
        view.advance(1);
        resource_.handleMessage(context, view);
        return context.replies().empty() ? vox::string("no reply") : context.replies().front();
    }
    std::string differenceOf(const std::string& name) {
        const auto expected = model_.assertions.find(name);
        const vox::object document = get("/at/" + name);
        const bool same = expected == model_.assertions.end()
                              ? !document
                              : sameDocument(vox::dict(document), expected->second);
        return same ? "" : name + " is " + oneLine(document);
    }
    std::string differenceOfAll() {
        const vox::dict dump(get("/at/*"));
        bool same = dump.count() == model_.assertions.size();
        for (const auto& [name, expected] : model_.assertions)
            // Who dropped is out of the sets, not only expired in them.
            same =
                same && sameDocument(vox::dict(dump[name.c_str()]), expected) &&
                resource_.createIfNotPresent(name).revoked.hasWatchers() != expected.lost.empty();
        return same ? "" : "all is " + oneLine(dump);
    }
    static bool sameDocument(const vox::dict& document, const Model::Assertion& expected) {
        const std::string provider =
            expected.provider == kNobody ? "" : std::to_string(expected.provider);
        return document.count() == 6 &&
               vox_int64_get_value(vox_dictionary_get_value(document.get(), "generation")) ==
                   static_cast<std::int64_t>(expected.generation()) &&
               document.text("state") == expected.standing() &&
               document.text("provider") == provider &&
               sameNames(document["granted"], expected.holding) &&
               sameNames(document["waiting"], expected.waiting) &&
               sameNames(document["revoked"], expected.lost);
    }
    static bool sameNames(const vox::array& names, const std::set<int>& expected) {
        bool same = names.count() == expected.size();
        for (std::size_t i = 0; same && i < names.count(); ++i)
            same = expected.count(std::stoi(std::string(names[i].text()))) != 0;
        return same;
    }

    Assertions& resource_;
    Model model_;
    std::mt19937 random_{kSeed};
    int connections_ = 0;
    std::array<int, kClients> numbers_{};
    std::array<std::shared_ptr<RestResourceConnection>, kClients> clients_;
};

TEST(AssertionModel, IsFollowed) {
    Assertions plain, holdingOff(hold_off), provided(provider_only);
    Walk(plain, {.holdOff = false, .providerOnly = false}).run(kSteps);
    Walk(holdingOff, {.holdOff = true, .providerOnly = false}).run(kSteps);
    Walk(provided, {.holdOff = false, .providerOnly = true}).run(kSteps / 10);
}

}  // namespace
