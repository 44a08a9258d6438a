#pragma once

// Messages between processes: values, also as Qf values; connections, servers and
// clients; results; activities that keep a service alive.
#include "plr/ipc/array.h"
#include "plr/ipc/auto_reply.h"
#include "plr/ipc/connection.h"
#include "plr/ipc/dict.h"
#include "plr/ipc/listener.h"
#include "plr/ipc/object.h"
#include "plr/ipc/qf_bridge.h"
#include "plr/ipc/read.h"
#include "plr/ipc/result.h"
#include "plr/ipc/values.h"
#include "plr/ipc/vox_client.h"
#include "plr/ipc/vox_drosk_assertion.h"
#include "plr/ipc/vox_server.h"
