#pragma once

#include "qf/base.h"

#ifdef __cplusplus
#include "dispatch/block.h"
#include "dispatch/queue.h"
#endif

// Preferences: settings of an application, which an administrator edits in TOML
// files (toml.io, 1.0) and a program reads and writes here. docs/preferences.md
// is the guide.
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
// A user by name is one of the system's, whose files are in .config of the home
// folder. The environment may name other folders: PELORIN_PREFERENCES_VENDOR,
// PELORIN_PREFERENCES_SYSTEM, PELORIN_PREFERENCES_USER (absolute; secure_getenv(3):
// not in set-user-id programs). Names and folders are looked up when an application
// is first read. Tables merge key by key; any other value replaces.
//
// | TOML                  | Qf                                                      |
// |-----------------------|---------------------------------------------------------|
// | string                | string                                                  |
// | integer               | number, SInt64 (any integer is written as one)          |
// | float                 | number, Double (Float is written as one)                |
// | boolean               | boolean                                                 |
// | date-time with offset | date (written in UTC)                                   |
// | local date-time       | date, in the local time zone                            |
// | local date, time      | string: 2024-12-31, 07:30:00                            |
// | { base64 = "SGk=" }   | data: an inline table of this one key (RFC 4648)        |
// | array, table          | array, dictionary                                       |
//
// Files have at most 1 MiB, and values at most 64 levels.
//
// Threads: everything on any thread. Reading what the thread has read before
//          takes no lock and no system call.
// Changes: files are watched (inotify) once they were read; a change is seen
//          by readers, and told to observers, without a restart. Where the
//          system has no more watches to give, or a folder may not be listed, that
//          is one of the errors, and files are looked at once a second. In a child
//          after fork() reading and writing work, other processes' changes are not
//          noticed.
// Memory:  what was read stays for the life of the process.
// Errors:  a file that cannot be read or is malformed is left out, its layer
//          keeps the values last read, and the error names file, line and
//          column ("FILE:LINE:COLUMN: text").
#ifdef __cplusplus
extern "C" {
#endif

// Arguments of special meaning. An application, user or host by name is a
// string of letters, digits, '.', '_' and '-', at most 128 bytes, not beginning
// with a '.'; any other one has no preferences.
PLR_EXPORT extern const QfStringRef kQfPreferencesCurrentUser;  // the effective one
PLR_EXPORT extern const QfStringRef kQfPreferencesAnyUser;      // vendor and system layers only
PLR_EXPORT extern const QfStringRef kQfPreferencesCurrentHost;
PLR_EXPORT extern const QfStringRef kQfPreferencesAnyHost;  // leaves the host's files out

// Errors are of domain "errno", with its numbers, or of "preferences":
typedef enum QfPreferencesError {
    kQfPreferencesErrorMalformed = 1,  // a file that is not TOML, or has a value out of range
    kQfPreferencesErrorValue = 2,  // a value that no file can hold; the text says which, and why
} QfPreferencesError;

// The value of `key` (a key of the file's root; a table is a dictionary) in the
// layers that `user` and `host` see; null when none has it, or no such user.
PLR_EXPORT QfTypeRef qf_preferences_copy_value(QfStringRef key, QfStringRef application,
                                               QfStringRef user, QfStringRef host);
// Everything, as one dictionary; empty when there is nothing.
PLR_EXPORT QfDictionaryRef qf_preferences_copy_all(QfStringRef application, QfStringRef user,
                                                   QfStringRef host);

// Sets `key` in the one file of `user` (kQfPreferencesAnyUser: the system
// layer; another user's: EPERM) and `host`; a null value removes it. The file
// holds the old content or the new one at any time, whatever happens to this process
// or the machine, and what other processes set is kept (a lock file; written to a
// temporary file, fsync, rename, fsync of the folder). Comments and order of what
// stays the same are kept; a malformed file is not touched. Waits for the disk and
// for other writers. This process reads the new value when it returns. Returns null,
// or an error, after which the old content stands; the caller releases it. No file
// can hold null, a URL, an error, a locale or formatter, an unsigned number past
// 2^63 - 1, text that is not UTF-8, or a dictionary of nothing but a string "base64".
PLR_EXPORT QfErrorRef qf_preferences_set_value(QfStringRef key, QfTypeRef value,
                                               QfStringRef application, QfStringRef user,
                                               QfStringRef host)
    __attribute__((warn_unused_result));
// Several at once: all of `values` are set and all of `removed` (array of
// strings, may be null) go, in one write.
PLR_EXPORT QfErrorRef qf_preferences_set_multiple(QfDictionaryRef values, QfArrayRef removed,
                                                  QfStringRef application, QfStringRef user,
                                                  QfStringRef host)
    __attribute__((warn_unused_result));

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
