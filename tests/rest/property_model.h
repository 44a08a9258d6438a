#pragma once

#include <set>

#include "plr/ipc/read.h"
#include "plr/test/fake_rest.h"

// What a property resource does, written down a second time, in text: what each
// step answers, and notifies to whom and in which order.
namespace plr::test::property_model {

using plr::rest::Operation;
using Connection = std::shared_ptr<plr::rest::RestResourceConnection>;
using Texts = std::vector<std::string>;

constexpr const char* kHuge = "k.99999999999999999999999";

// {"k": [number, number + 1]}
inline vox::dict partsOf(const vox::object& number) {
    const vox::array list = vox::array::create();
    list.append(number);
    list.append(vox::int64(vox::dyn_cast_or_default(number, 0LL) + 1));
    const vox::dict parts = vox::dict::create();
    parts["k"] = list;
    return parts;
}

inline std::string listOf(const Texts& names) {
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

// What stands behind the resource's path.
struct Path {
    Kind kind;
    std::string text;
    std::string name = {}, subpath = {};  // of the property
};

inline const Path kRootPaths[] = {
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
    {Kind::Unknown, "/*/x"},
};

struct Step {
    Operation operation;
    Kind kind;
    std::string base;           // the resource's path, as this message spells it
    std::string name, subpath;  // of the property
    std::string path;           // all of it
    vox::object value;
    bool isCleanup = false;  // of those who went, in place of a message
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
        const bool handled = step.isCleanup                       ? cleanUp()
                             : step.operation == Operation::kGet  ? get()
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
        vox::object value;
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
                return known ? part(found->second.value) : "null";
            case Kind::ResourceMeta:
                return R"([0: "watchers"])";
            case Kind::ResourceWatchers:
                return known ? listOf(found->second.watchers.names()) : "[]";
            case Kind::Unknown:
                break;
        }
        return "null";
    }
    [[nodiscard]] std::string part(const vox::object& value) const {
        if (step_->subpath.empty())
            return oneLine(value);
        const bool isNoIndex = step_->subpath == "k.word" || step_->subpath == kHuge;
        return isNoIndex ? "null" : oneLine(vox::get_subpath(value, step_->subpath));
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
        notify(property.watchers, propertyPath(), oneLine(step_->value));
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
            notifyOne(author_->name(), propertyPath(), oneLine(property.value));
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

    bool cleanUp() {
        bool lostLast = false;
        rootWatchers_.clean();
        watchedWatchers_.clean();
        for (auto& entry : properties_) {
            Watchers& watchers = entry.second.watchers;
            const bool hadWatchers = !watchers.empty();
            watchers.clean();
            lostLast |= hadWatchers && watchers.empty();
        }
        if (lostLast)
            notifyWatched();
        return true;
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
                entries +=
                    (entries.empty() ? "\"" : ",\"") + name + "\": " + oneLine(property.value);
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

}  // namespace plr::test::property_model
