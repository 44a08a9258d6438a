#pragma once

#include "plr/concurrency/qf_shared_ref.h"
#include "plr/qf/map_adapter.h"

namespace plr::qf {

// The values of a dictionary, which it retains. Copies share the dictionary.
class PLR_EXPORT dict_adapter : public map_adapter {
  public:
    // Null is a dictionary without keys. `adopt`: takes over the caller's
    // reference instead of adding one.
    explicit dict_adapter(QfDictionaryRef dictionary, bool adopt = false);

    [[nodiscard]] QfTypeRef copyQfTypeRef(QfStringRef key) const override;

  private:
    QfSharedRef<Dictionary> dictionary_;
};

}  // namespace plr::qf
