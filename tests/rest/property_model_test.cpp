// Random steps on property resources and on a model of them: what is handled,
// answered and notified, to whom and in which order, is the same at every step.
#include <gtest/gtest.h>

#include <array>
#include <cstdint>
#include <map>
#include <memory>
#include <random>
#include <set>
#include <string>
#include <vector>

#include "plr/rest/property_resource.h"
#include "support/fake_rest.h"

namespace {

using namespace plr::test;
using plr::rest::Operation;
using plr::rest::PathView;
using Connection = std::shared_ptr<plr::rest::RestResourceConnection>;
using Texts = std::vector<std::string>;

constexpr int kSteps = 100'000;
constexpr std::uint32_t kSeed = 20'261'121;

// Null, a number N, or {"k": [N, N + 1]}.
struct Value {
    int number = 0;
    enum { kNull, kNumber, kDictionary } type = kNull;

    [[nodiscard]] vox::object object() const {
        if (type != kDictionary)
            return type == kNumber ? vox::int64(number) : vox::object();
        const vox::dict dictionary = vox::dict::create();
        const vox::array list = vox::array::create();
        list.append(vox::int64(number));
        list.append(vox::int64(number + 1));
        dictionary["k"] = list;
        return dictionary;
    }
    [[nodiscard]] std::string list() const {
        return "[0: " + std::to_string(number) + ",1: " + std::to_string(number + 1) + "]";
    }
    [[nodiscard]] std::string text() const {
        if (type == kDictionary)
            return R"({"k": )" + list() + "}";
        return type == kNumber ? std::to_string(number) : "null";
    }
    [[nodiscard]] std::string part(const std::string& subpath) const {
        if (subpath.empty())
            return text();
        if (type != kDictionary || (subpath != "k" && subpath != "k.1"))
            return "null";
        return subpath == "k" ? list() : std::to_string(number + 1);
    }
};

std::string listOf(const Texts& names) {
    std::string list;
    for (std::size_t i = 0; i < names.size(); ++i)
        list += (i > 0 ? "," : "") + std::to_string(i) + ": \"" + names[i] + '"';
    return '[' + list + ']';
}

enum class Kind {
    Root,
    Meta,
    MetaWatchers,
    MetaWatched,
    MetaWatchedMetaWatchers,
    DumpState,
    Resource,
    ResourceMeta,
    ResourceWatchers,
    Unknown
};

struct Step {
    Operation operation;
    Kind kind;
    std::string base;           // the resource's path, as this message spells it
    std::string name, subpath;  // of the property
    std::string path;           // all of it
    Value value;
};

// What a step shows.
struct Outcome {
    bool handled = false;
    Texts lines;  // answers and notifications
    bool operator==(const Outcome&) const = default;
};

class Model {
  public:
    explicit Model(bool keepsValues) : keepsValues_(keepsValues) {}

    Outcome apply(const Step& step, const Connection& author) {
        step_ = &step;
        author_ = author;
        lines_.clear();
        const bool handled = step.operation == Operation::kGet    ? get()
                             : step.operation == Operation::kSet  ? set()
                             : step.operation == Operation::kPush ? push()
                             : step.operation == Operation::kPop  ? pop()
                                                                  : false;
        return {handled, lines_};
    }

  private:
    struct Watchers
        : std::set<std::weak_ptr<plr::rest::RestResourceConnection>, std::owner_less<>> {
        void clean() {
            std::erase_if(*this, [](const auto& entry) { return entry.expired(); });
        }
        [[nodiscard]] Texts names() const {
            Texts names;
            for (const auto& entry : *this)
                if (const Connection live = entry.lock())
                    names.push_back(live->name());
            return names;
        }
    };
    struct Property {
        Watchers watchers;
        Value value;
    };

    [[nodiscard]] std::string answer() const {
        const auto found = properties_.find(step_->name);
        const bool known = found != properties_.end();
        switch (step_->kind) {
            case Kind::Root:
                return names();
            case Kind::Meta:
                return R"([0: "watchers",1: "watched"])";
            case Kind::MetaWatchers:
                return listOf(rootWatchers_.names());
            case Kind::MetaWatched:
                return watched();
            case Kind::MetaWatchedMetaWatchers:
                return listOf(watchedWatchers_.names());
            case Kind::DumpState:
                return dump();
            case Kind::Resource:
                return known && keepsValues_ ? found->second.value.part(step_->subpath) : "null";
            case Kind::ResourceMeta:
                return R"([0: "watchers"])";
            case Kind::ResourceWatchers:
                return known ? listOf(found->second.watchers.names()) : "[]";
            case Kind::Unknown:
                break;
        }
        return "null";
    }
    bool get() {
        lines_.push_back("answer " + answer());
        return true;
    }

    bool set() {
        if (step_->kind != Kind::Resource)
            return step_->kind != Kind::DumpState;
        if (!step_->subpath.empty())
            return false;
        Property& property = make();
        if (keepsValues_)
            property.value = step_->value;
        notify(property.watchers, propertyPath(), step_->value.text());
        return true;
    }

    bool push() {
        if (step_->kind == Kind::Resource) {
            pushProperty(make());
        } else if (step_->kind == Kind::Root && author_) {
            rootWatchers_.insert(author_);
            notifyOne(author_->name(), step_->base, names());
        } else if (step_->kind == Kind::MetaWatched && author_) {
            watchedWatchers_.insert(author_);
            notifyOne(author_->name(), step_->base + "/_/watched", watched());
        }
        return step_->kind != Kind::DumpState && step_->kind != Kind::Unknown;
    }
    void pushProperty(Property& property) {
        if (!author_)
            return;
        const bool hadWatchers = !property.watchers.empty();
        property.watchers.clean();
        property.watchers.insert(author_);
        if (!hadWatchers)
            notifyWatched();
        if (keepsValues_)
            notifyOne(author_->name(), propertyPath(), property.value.text());
    }

    bool pop() {
        if (step_->kind == Kind::Root)
            rootWatchers_.erase(author_);
        else if (step_->kind == Kind::MetaWatched)
            watchedWatchers_.erase(author_);
        else if (step_->kind == Kind::Resource && properties_.contains(step_->name))
            popProperty(properties_[step_->name].watchers);
        return step_->kind != Kind::DumpState && step_->kind != Kind::Unknown;
    }
    void popProperty(Watchers& watchers) {
        if (watchers.erase(author_) > 0 && watchers.empty())
            notifyWatched();
    }

    Property& make() {
        const auto [place, made] = properties_.try_emplace(step_->name);
        if (made)
            notify(rootWatchers_, step_->base, names());
        return place->second;
    }

    [[nodiscard]] std::string propertyPath() const {
        return step_->name.empty() ? step_->base : step_->base + '/' + step_->name;
    }
    [[nodiscard]] std::string names() const {
        Texts names;
        for (const auto& property : properties_)
            names.push_back(property.first);
        return listOf(names);
    }
    [[nodiscard]] std::string watched() const {
        Texts names;
        for (const auto& [name, property] : properties_)
            if (!property.watchers.names().empty())
                names.push_back(name);
        return listOf(names);
    }
    // The nameless property cannot be an answer of its own.
    [[nodiscard]] std::string dump() const {
        std::string entries;
        for (const auto& [name, property] : properties_)
            if (!name.empty())
                entries += (entries.empty() ? "\"" : ",\"") + name + "\": " + property.value.text();
        return '{' + entries + '}';
    }

    void notifyOne(const std::string& watcher, const std::string& path, const std::string& value) {
        lines_.push_back(watcher + ": notify " + watcher + ' ' + path + ' ' + value);
    }
    void notify(const Watchers& watchers, const std::string& path, const std::string& value) {
        for (const std::string& watcher : watchers.names())
            notifyOne(watcher, path, value);
    }
    void notifyWatched() { notify(watchedWatchers_, step_->base + "/_/watched", watched()); }

    const bool keepsValues_;
    std::map<std::string, Property> properties_;
    Watchers rootWatchers_;
    Watchers watchedWatchers_;

    // Of the step that is being applied.
    const Step* step_ = nullptr;
    Connection author_;
    Texts lines_;
};

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
        static constexpr const char* kSubpaths[] = {"", "k", "k.1", "k.word", "none"};
        static constexpr const char* kTails[] = {"", "", "", "/other", "/_/other", "/_/watchers/y"};
        static constexpr std::pair<Kind, const char*> kMeta[] = {
            {Kind::Root, ""},
            {Kind::Meta, "/_"},
            {Kind::MetaWatchers, "/_/watchers"},
            {Kind::MetaWatched, "/_/watched"},
            {Kind::MetaWatchedMetaWatchers, "/_/watched/_/watchers"},
            {Kind::DumpState, "/*"},
            {Kind::Unknown, "/_/other"},
            {Kind::Unknown, "/_/watchers/x"},
            {Kind::Unknown, "/_/watched/x"},
            {Kind::Unknown, "/_/watched/_"},
            {Kind::Unknown, "/_/watched/_/watchers/x"},
            {Kind::Unknown, "/*/x"}};
        if (below(3) == 0) {
            const auto& [kind, text] = oneOf(kMeta);
            step.kind = kind;
            return text;
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
        static constexpr Operation kOperations[] = {
            Operation::kGet,  Operation::kSet,  Operation::kSet, Operation::kPush,
            Operation::kPush, Operation::kPush, Operation::kPop, Operation::kNotify};
        Step step{
            oneOf(kOperations), Kind::Root, below(4) == 0 ? "in/tree" : "/kept", {}, {}, {}, {}};
        step.path = step.base + randomRest(step) + (below(16) == 0 ? "/" : "");
        step.value.number = static_cast<int>(below(4));  // the same one comes often
        step.value.type = oneOf(std::array{Value::kNull, Value::kNumber, Value::kDictionary});
        return step;
    }

    Outcome applyToResource(const Step& step, const Connection& author) {
        FakeRestContext context(step.operation, step.value.object(), author);
        PathView path(step.path);
        path.advance(step.base.front() == '/' ? 1 : 2);
        sent_.clear();
        Outcome outcome{resource_.handleMessage(context, path), {}};
        for (const vox::object& reply : context.replies())
            outcome.lines.push_back("answer " + oneLine(reply));
        outcome.lines.insert(outcome.lines.end(), sent_.begin(), sent_.end());
        return outcome;
    }

    void dropOne() {
        Connection& client = clients_[below(static_cast<unsigned>(clients_.size()))];
        FakeRestContext context{Operation::kNotify};
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
            << plr::rest::asObject(step.operation).text() << ' ' << step.path << ' '
            << step.value.text() << " by " << (author ? author->name() : "nobody") << "\nexpected "
            << expected.handled << ' ' << testing::PrintToString(expected.lines) << "\nseen     "
            << seen.handled << ' ' << testing::PrintToString(seen.lines);
        shown += seen.lines.size();
    }
    EXPECT_GT(shown, std::size_t{kSteps}) << "these steps do too little to tell";
}

INSTANTIATE_TEST_SUITE_P(Values, PropertyModel, testing::Values(true, false),
                         [](const auto& keeps) { return keeps.param ? "Kept" : "PassedOn"; });

}  // namespace
