#pragma once

#include "plr/concurrency/qf_shared_ref.h"
#include "plr/qf/map_adapter.h"

namespace plr::qf {

// The preferences of an application (qf/preferences.h), as `user` sees them on
// this host now: a later call may read a later value. Both names are retained.
class PLR_EXPORT plist_adapter : public map_adapter {
  public:
    // A null application has no values. A null user is the current one.
    explicit plist_adapter(QfStringRef application, QfStringRef user = nullptr);

    [[nodiscard]] QfTypeRef copyQfTypeRef(QfStringRef key) const override;

  private:
    QfSharedRef<String> application_;
    QfSharedRef<String> user_;
};

}  // namespace plr::qf
