#pragma once

// The whole class interface.
#include "plr/concurrency.h"
#include "plr/format.h"
#include "plr/ipc.h"
#include "plr/log.h"
#include "plr/log/vox_log_server.h"
#include "plr/log/vox_logger.h"
#include "plr/qf.h"
#include "plr/rest.h"
#include "plr/text.h"
