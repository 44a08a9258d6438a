#pragma once

#include "dispatch/block.h"
#include "dispatch/queue.h"
#include "qf/base.h"

// Preferences: settings of an application, which an administrator edits in TOML
// files (toml.io, 1.0) and a program reads and writes here.
//
// A key is looked up in layers, the later winning: vendor, system, user; in
// each the file for any host, then that for this host.
//
//   vendor   /usr/share/pelorin/preferences/     comes with packages; never written here
//   system   /etc/pelorin/preferences/           "any user"
//   user     $XDG_CONFIG_HOME/pelorin/preferences/, else ~/.config/pelorin/preferences/
//            APPLICATION.toml                    any host
//            APPLICATION@HOST.toml               this host, by gethostname()
//
// The environment may name other folders: PELORIN_PREFERENCES_VENDOR,
// PELORIN_PREFERENCES_SYSTEM, PELORIN_PREFERENCES_USER (secure_getenv: not in
// set-user-id programs). Tables merge key by key; any other value replaces.
//
// Threads: everything on any thread. Reading what was read before takes no
//          lock and no system call.
// Changes: files are watched (inotify) once they were read; a change is seen
//          by readers, and told to observers, without a restart.
// Errors:  a file that cannot be read or is malformed is left out, its layer
//          keeps the values last read, and the error names file, line and column.
#ifdef __cplusplus
extern "C" {
#endif

// Arguments of special meaning. An application, user or host by name is a
// string of letters, digits, '.', '_' and '-', at most 128 bytes, not beginning
// with a '.'; any other one has no preferences.
PLR_EXPORT extern const QfStringRef kQfPreferencesCurrentUser;
PLR_EXPORT extern const QfStringRef kQfPreferencesAnyUser;  // vendor and system layers only
PLR_EXPORT extern const QfStringRef kQfPreferencesCurrentHost;
PLR_EXPORT extern const QfStringRef kQfPreferencesAnyHost;  // leaves the host's files out

// The value of `key` (a key of the file's root; a table is a dictionary) in the
// layers that `user` and `host` see; null when none has it, or no such user.
PLR_EXPORT QfTypeRef qf_preferences_copy_value(QfStringRef key, QfStringRef application,
                                               QfStringRef user, QfStringRef host);
// Everything, as one dictionary; empty when there is nothing.
PLR_EXPORT QfDictionaryRef qf_preferences_copy_all(QfStringRef application, QfStringRef user,
                                                   QfStringRef host);

// Sets `key` in the one file of `user` (kQfPreferencesAnyUser: the system
// layer) and `host`; a null value removes it. The file holds the old content or
// the new one at any time, whatever happens to this process or the machine, and
// what other processes set is kept (a lock file; written to a temporary file,
// fsync, rename, fsync of the folder). Comments and the order of the file stay.
// Blocks for the disk. Returns null, or an error (domain "errno", or
// "preferences" for a value that TOML cannot hold: null, URL, error, NaN keys,
// unsigned numbers past 2^63 - 1), after which the old content stands.
[[nodiscard]] PLR_EXPORT QfErrorRef qf_preferences_set_value(QfStringRef key, QfTypeRef value,
                                                             QfStringRef application,
                                                             QfStringRef user, QfStringRef host);
// Several at once: all of `values` are set and all of `removed` (array of
// strings, may be null) go, in one write.
[[nodiscard]] PLR_EXPORT QfErrorRef qf_preferences_set_multiple(QfDictionaryRef values,
                                                                QfArrayRef removed,
                                                                QfStringRef application,
                                                                QfStringRef user, QfStringRef host);

// What is wrong with the files of these layers now: an array of errors, empty
// when nothing is.
PLR_EXPORT QfArrayRef qf_preferences_copy_errors(QfStringRef application, QfStringRef user,
                                                 QfStringRef host);

#ifdef __cplusplus
}

namespace qf {

// Calls `handler` on `queue` after each change of what the application's
// preferences say for the current user and host (or of their errors), whoever
// made it; several changes may come as one. Lives until it is destroyed or
// cancelled; after cancel() on the queue no call begins. Move-only.
class preferences_observer {
  public:
    preferences_observer() noexcept = default;
    PLR_EXPORT preferences_observer(QfStringRef application, const dispatch::queue& queue,
                                    dispatch::block<void()> handler);
    PLR_EXPORT preferences_observer(preferences_observer&& other) noexcept;
    PLR_EXPORT preferences_observer& operator=(preferences_observer&& other) noexcept;
    PLR_EXPORT ~preferences_observer();
    PLR_EXPORT void cancel() noexcept;

  private:
    struct state;
    state* state_ = nullptr;
};

}  // namespace qf
#endif
