#pragma once

// Logging: domains and levels, loggers, the server and its writers. Format
// strings of {fmt}, which their users install, are in plr/log/fmt.h; logging from
// one process into another, in plr/log/vox_logger.h and plr/log/vox_log_server.h.
#include "plr/log/console_log_writer.h"
#include "plr/log/crash_drain.h"
#include "plr/log/file_log_writer.h"
#include "plr/log/kel_log_writer.h"
#include "plr/log/log_level.h"
#include "plr/log/log_message.h"
#include "plr/log/log_message_buffer.h"
#include "plr/log/log_server.h"
#include "plr/log/log_tag.h"
#include "plr/log/log_writer.h"
#include "plr/log/loggable.h"
#include "plr/log/logger.h"
#include "plr/log/memory_buffered_log_writer.h"
#include "plr/log/scoped_log_flusher.h"
#include "plr/log/shared_loggable.h"
#include "plr/log/staged_logger.h"
#include "plr/log/static_logger.h"
#include "plr/log/tracked_logger.h"
#include "plr/log/trel_context.h"
