#pragma once

#include <memory>
#include <type_traits>
#include <utility>

// "Do nothing once the object is gone": a callback for other parties that
// holds its object weakly. `callable` takes the object by reference, then the
// callback's arguments; the object stays alive during the call.
//
//   timer.setHandler(whileAlive(weak_from_this(), [](Thing& self) { … }));
//
// Threads: calls run on the caller's thread; a callable that touches state
//          starts with the object's ownQueue_.assertCurrent().
namespace plr {

template <class T, class Callable>
class WhileAlive {
  public:
    WhileAlive(std::weak_ptr<T> object, Callable callable)
        : object_(std::move(object)), callable_(std::move(callable)) {}

    template <class... Arguments>
    requires std::is_invocable_v<Callable&, T&, Arguments...>
    void operator()(Arguments&&... arguments) {
        if (const std::shared_ptr<T> alive = object_.lock())
            callable_(*alive, std::forward<Arguments>(arguments)...);
    }

  private:
    std::weak_ptr<T> object_;
    Callable callable_;
};

template <class T, class Callable>
[[nodiscard]] WhileAlive<T, std::decay_t<Callable>> whileAlive(std::weak_ptr<T> object,
                                                               Callable&& callable) {
    return {std::move(object), std::forward<Callable>(callable)};
}

}  // namespace plr
