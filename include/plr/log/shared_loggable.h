#pragma once

#include <memory>
#include <utility>

#include "plr/concurrency/shared_synchronizable.h"
#include "plr/log/loggable.h"

// SharedLoggable<T> is the base of an object with a queue and a logger of its
// own. T is the deriving class.
//
//   class Radio : public SharedLoggable<Radio> {
//     public:
//       static std::shared_ptr<Radio> create(std::shared_ptr<LogServer> server) {
//           std::shared_ptr<Radio> radio = make_shared_ptr(new Radio(std::move(server)));
//           radio->execute_wrapped([self = radio.get()] { self->init_sync(); });
//           return radio;
//       }
//
//     private:
//       explicit Radio(std::shared_ptr<LogServer> server)
//           : SharedLoggable("Radio", "radio", std::move(server)) {}
//   };
//
// Owner:   as SharedSynchronizable's: the std::shared_ptr of make_shared_ptr().
// Queue:   made before the logger, destroyed after it; also when T's constructor
//          throws.
// Order:   the logger has the level that the server's configuration gives its
//          domain before anybody but make_shared_ptr() has the object.
namespace plr {

template <class T, class LoggerType = LoggerBase<std::shared_ptr<LogServer>>>
class SharedLoggable : public SharedSynchronizable<T>, public Loggable<T, LoggerType> {
  public:
    // Makes a freshly built object owned and registers its logger, on the caller's
    // thread. When that throws, the object is destroyed on its queue.
    template <class Derived>
    [[nodiscard]] static std::shared_ptr<Derived> make_shared_ptr(Derived* object) {
        std::shared_ptr<Derived> owner = SharedSynchronizable<T>::make_shared_ptr(object);
        if (owner)
            static_cast<SharedLoggable&>(*owner).connectToLogServer_sync();
        return owner;
    }

  protected:
    // The queue's label, and the logger's name, which is its domain; both
    // NUL-terminated. The server may be empty: then nothing is logged.
    SharedLoggable(const char* label, const char* loggerName, std::shared_ptr<LogServer> server)
        : SharedSynchronizable<T>(label), Loggable<T, LoggerType>(loggerName, std::move(server)) {}
    ~SharedLoggable() override = default;
};

}  // namespace plr
