#pragma once

// PLR_EXPORT marks what libpelorin and libpelorin-platform offer to their
// users; everything else is hidden.
#define PLR_EXPORT __attribute__((visibility("default")))
