#pragma once

// Qf values, as settings and device answers come, read into native ones and made
// of them. Autorelease pools, and files in memory, which go with them.
#include "plr/concurrency/qf_shared_ref.h"
#include "plr/io/memory_mapped_file.h"
#include "plr/ob/auto_pool.h"
#include "plr/qf/assign.h"
#include "plr/qf/assign_loosely.h"
#include "plr/qf/convert_copy.h"
#include "plr/qf/dict_adapter.h"
#include "plr/qf/make_qf_string.h"
#include "plr/qf/map_adapter.h"
#include "plr/qf/plist_adapter.h"
#include "plr/qf/show.h"
