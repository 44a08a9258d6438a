#pragma once

// Objects that own a serial queue, timers, and what goes with them.
#include "plr/concurrency/async_dispatch_callback.h"
#include "plr/concurrency/clock.h"
#include "plr/concurrency/dispatch_timer_service.h"
#include "plr/concurrency/monitor.h"
#include "plr/concurrency/priority_queue.h"
#include "plr/concurrency/qf_shared_ref.h"
#include "plr/concurrency/queue_role.h"
#include "plr/concurrency/shared_ref.h"
#include "plr/concurrency/shared_synchronizable.h"
#include "plr/concurrency/timer_service.h"
#include "plr/concurrency/while_alive.h"
