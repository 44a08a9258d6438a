#pragma once

#include <array>
#include <cstddef>
#include <new>
#include <utility>

#include "plr/base/thread_annotations.h"
#include "src/base/brief_mutex.h"

// Recycled things. What is made on one thread and freed on another would go
// back through the heap's locks; so each thread takes things from one magazine
// and puts freed ones into another, and exchanges whole magazines with a common
// depot: one lock for every `Source::kMagazine` things.
//
// A magazine is an array beside the things and first in, first out: taking one
// reads nothing of it, so the producer does not wait for a cache line that the
// consumer had, and things keep the order of their addresses, which hardware
// prefetches.
//
// `Source` says how many things a magazine and how many magazines the depot
// holds, and has static functions: fill(places) makes kMagazine of them (may
// throw std::bad_alloc, with nothing made) and discard(thing) ends one.
// Any thread, until the thread's end and during it.
namespace plr::detail {

template <class Thing, class Source>
class Magazines {
  public:
    static constexpr std::size_t kMagazine = Source::kMagazine;
    using Places = std::array<Thing*, kMagazine>;

    // Throws std::bad_alloc.
    [[nodiscard]] static Thing* take() {
        if (local.next == local.end) [[unlikely]]
            return refill();
        return *local.next++;
    }

    static void give(Thing* unused) noexcept {
        if (local.place == local.last) [[unlikely]]
            return makePlace(unused);
        *local.place++ = unused;
    }

    // The depot's, for a fork: nobody is in the middle of a change while it is held.
    static BriefMutex& depotLock() noexcept { return depot.lock(); }

  private:
    struct Magazine {
        Magazine* next = nullptr;  // in the depot
        Places things;
    };

    class Depot {
      public:
        // A full magazine, null when there is none.
        Magazine* takeFull() noexcept { return take(full_, fullCount_); }
        // An empty one. Throws std::bad_alloc.
        Magazine* takeEmpty() {
            Magazine* taken = take(empty_, emptyCount_);
            return taken ? taken : new Magazine;
        }
        void giveFull(Magazine* given) noexcept {
            if (give(full_, fullCount_, given))
                return;
            for (Thing* thing : given->things)
                Source::discard(thing);
            giveEmpty(given);
        }
        void giveEmpty(Magazine* given) noexcept {
            if (!give(empty_, emptyCount_, given))
                delete given;
        }

        BriefMutex& lock() noexcept { return lock_; }

      private:
        Magazine* take(Magazine*& list, std::size_t& count) noexcept {
            const BriefLock guard(lock_);
            if (!list)
                return nullptr;
            --count;
            return std::exchange(list, list->next);
        }
        bool give(Magazine*& list, std::size_t& count, Magazine* given) noexcept {
            const BriefLock guard(lock_);
            if (count == Source::kDepotMagazines)
                return false;
            ++count;
            given->next = std::exchange(list, given);
            return true;
        }

        // The lists change under the lock.
        BriefMutex lock_;
        Magazine* full_ = nullptr;
        Magazine* empty_ = nullptr;
        std::size_t fullCount_ = 0;
        std::size_t emptyCount_ = 0;
    };

    // Plain data, so that the hot path has no guard to check.
    struct Local {
        Thing** next;  // to take, in `taking`
        Thing** end;
        Thing** place;  // for the next freed one, in `giving`
        Thing** last;   // one past the last place
        Magazine* taking;
        Magazine* giving;
    };

    // Discards what a thread held when it ends.
    struct Owner {
        ~Owner() {
            Local ended = std::exchange(local, {});
            while (ended.next != ended.end)
                Source::discard(*ended.next++);
            while (ended.giving && ended.place != ended.giving->things.data())
                Source::discard(*--ended.place);
            delete ended.taking;
            delete ended.giving;
        }
    };

    static void ownLocal() {
        static thread_local Owner owner;
        static_cast<void>(&owner);
    }

    static void load(Magazine* filled, std::size_t count) noexcept {
        local.taking = filled;
        local.next = filled->things.data();
        local.end = local.next + count;
    }

    [[gnu::noinline]] static Thing* refill() {
        ownLocal();
        if (Magazine* full = depot.takeFull()) {
            if (local.taking)
                depot.giveEmpty(local.taking);
            load(full, kMagazine);
        } else if (local.giving && local.place != local.giving->things.data()) {
            takeBackOwn();
        } else {
            Magazine* empty = local.taking ? local.taking : depot.takeEmpty();
            local.taking = empty;
            Source::fill(empty->things);
            load(empty, kMagazine);
        }
        return *local.next++;
    }

    // What this thread freed itself.
    static void takeBackOwn() noexcept {
        const auto count = static_cast<std::size_t>(local.place - local.giving->things.data());
        std::swap(local.taking, local.giving);
        load(local.taking, count);
        local.place = local.giving ? local.giving->things.data() : nullptr;
        local.last = local.giving ? local.place + kMagazine : nullptr;
    }

    // Out of memory for a magazine: the thing just goes.
    [[gnu::noinline]] static void makePlace(Thing* unused) noexcept {
        try {
            ownLocal();
            if (local.giving)
                depot.giveFull(std::exchange(local.giving, nullptr));
            local.place = local.last = nullptr;
            local.giving = depot.takeEmpty();
            local.place = local.giving->things.data();
            local.last = local.place + kMagazine;
            *local.place++ = unused;
        } catch (const std::bad_alloc&) {
            Source::discard(unused);
        }
    }

    static constinit inline Depot depot{};
    [[gnu::tls_model("initial-exec")]] static constinit inline thread_local Local local{};
};

// Sanitizers are to see the life of every thing: users of magazines go straight
// to the heap then.
#if defined(__SANITIZE_ADDRESS__) || defined(__SANITIZE_THREAD__)
inline constexpr bool kRecycle = false;
#elif defined(__has_feature)
#if __has_feature(address_sanitizer) || __has_feature(thread_sanitizer)
inline constexpr bool kRecycle = false;
#else
inline constexpr bool kRecycle = true;
#endif
#else
inline constexpr bool kRecycle = true;
#endif

}  // namespace plr::detail
