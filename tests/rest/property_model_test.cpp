// Random steps on property resources and on a model of them: what is handled,
// answered and notified, to whom and in which order, is the same at every step.
#include <gtest/gtest.h>

#include <random>

#include "plr/rest/property_resource.h"
#include "plr/test/fake_rest.h"
#include "support/sanitized.h"
#include "tests/rest/property_model.h"

namespace {

using namespace plr::test;
using namespace plr::test::property_model;
using plr::rest::PathView;
using enum plr::rest::Operation;

constexpr int kSteps = kSanitized ? 10'000 : 100'000;
constexpr std::uint32_t kSeed = 20'261'121;

// Writes what it is sent into a log that all share.
class LoggingConnection : public FakeRestConnection {
  public:
    LoggingConnection(std::string name, Texts& log)
        : FakeRestConnection(std::move(name)), log_(log) {}
    void send(vox::dict message) const override {
        std::string line = name() + ':';
        for (const char* key : {"o", "a", "r"})
            line.append(" ").append(vox::object(message[key]).text());
        log_.push_back(line + ' ' + oneLine(message["v"]));
    }

  private:
    Texts& log_;
};

class PropertyModel : public testing::TestWithParam<bool> {
  protected:
    unsigned below(unsigned bound) { return static_cast<unsigned>(random_()) % bound; }
    template <class List>
    const auto& oneOf(const List& list) {
        return list[below(static_cast<unsigned>(std::size(list)))];
    }

    // One of 20 clients, who may have gone since and come again; or one that
    // nobody knows.
    Connection author() {
        if (below(16) == 0)
            return nullptr;
        const unsigned number = below(static_cast<unsigned>(clients_.size()));
        Connection& client = clients_[number];
        if (!client)
            client = std::make_shared<LoggingConnection>(
                'c' + std::to_string(number) + '.' + std::to_string(++connections_), sent_);
        return client;
    }

    // What follows the resource's path; the step learns what it means.
    std::string randomRest(Step& step) {
        static constexpr const char* kNames[] = {"x",  "x",  "y", "watchers", "watched",
                                                 "__", "*y", "z", ""};
        static constexpr const char* kSubpaths[] = {"", "k", "k.1", "k.word", "none", kHuge};
        static constexpr const char* kTails[] = {"", "", "", "/other", "/_/other", "/_/watchers/y"};
        if (below(3) == 0) {
            const Path& path = oneOf(kRootPaths);
            step.kind = path.kind;
            return path.text;
        }
        step.name = oneOf(kNames);
        // New ones now and then, for as long as it goes.
        if (step.name == "z")
            step.name += std::to_string(below(64));
        const bool whole = !step.name.empty() && below(3) != 0;
        step.subpath = whole ? "" : oneOf(kSubpaths);
        step.kind = below(8) != 0   ? Kind::Resource
                    : below(2) != 0 ? Kind::ResourceMeta
                                    : Kind::ResourceWatchers;
        const char* const tail = step.kind == Kind::Resource       ? oneOf(kTails)
                                 : step.kind == Kind::ResourceMeta ? "/_"
                                                                   : "/_/watchers";
        return '/' + step.name + (whole ? "" : '@' + step.subpath) + tail;
    }

    Step randomStep() {
        static constexpr Operation kOperations[] = {kGet,  kSet,  kSet, kPush,
                                                    kPush, kPush, kPop, kNotify};
        Step step{
            oneOf(kOperations), Kind::Root, below(4) == 0 ? "in/tree" : "/kept", {}, {}, {}, {}};
        const vox::object number = vox::int64(below(4));  // the same one comes often
        step.path = step.base + randomRest(step) + (below(16) == 0 ? "/" : "");
        step.value = oneOf(std::array<vox::object, 3>{{{}, number, partsOf(number)}});
        step.isCleanup = below(128) == 0;
        return step;
    }

    Outcome applyToResource(const Step& step, const Connection& author) {
        FakeRestContext context(step.operation, step.value, author);
        PathView path(step.path);
        path.advance(step.base.front() == '/' ? 1 : 2);
        sent_.clear();
        Outcome outcome{true, {}};
        if (step.isCleanup)
            resource_.cleanupWatchers(context, PathView(step.base));
        else
            outcome.handled = resource_.handleMessage(context, path);
        for (const vox::object& reply : context.replies())
            outcome.lines.push_back("answer " + oneLine(reply));
        outcome.lines.insert(outcome.lines.end(), sent_.begin(), sent_.end());
        return outcome;
    }

    void dropOne() {
        Connection& client = clients_[below(static_cast<unsigned>(clients_.size()))];
        FakeRestContext context{kNotify};
        resource_.handleDroppedConnection(context, PathView("/kept"), client);
        client.reset();
    }

    plr::rest::PropertyRestResource resource_{GetParam()};
    Model model_{GetParam()};
    Texts sent_;  // outlives the connections
    std::array<Connection, 20> clients_;
    int connections_ = 0;
    std::mt19937 random_{kSeed};
};

TEST_P(PropertyModel, TheResourceDoesWhatItsModelDoes) {
    std::size_t shown = 0;
    for (int number = 0; number < kSteps; ++number) {
        if (below(64) == 0)
            dropOne();
        const Step step = randomStep();
        const Connection author = this->author();
        const Outcome expected = model_.apply(step, author);
        const Outcome seen = applyToResource(step, author);
        ASSERT_TRUE(seen == expected)
            << "seed " << kSeed << ", step " << number << ": "
            << (step.isCleanup ? "clean" : plr::rest::asObject(step.operation).text()) << ' '
            << step.path << ' ' << oneLine(step.value) << " by "
            << (author ? author->name() : "nobody") << "\nexpected " << expected.handled << ' '
            << testing::PrintToString(expected.lines) << "\nseen     " << seen.handled << ' '
            << testing::PrintToString(seen.lines);
        shown += seen.lines.size();
    }
    EXPECT_GT(shown, std::size_t{kSteps}) << "these steps do too little to tell";
}

INSTANTIATE_TEST_SUITE_P(Values, PropertyModel, testing::Values(true, false),
                         [](const auto& keeps) { return keeps.param ? "Kept" : "PassedOn"; });

}  // namespace
