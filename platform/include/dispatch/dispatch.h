#pragma once

// Everything of namespace dispatch.
#include "dispatch/block.h"
#include "dispatch/calendar.h"
#include "dispatch/diagnostics.h"
#include "dispatch/group.h"
#include "dispatch/main_queue.h"
#include "dispatch/pump.h"
#include "dispatch/queue.h"
#include "dispatch/source.h"
#include "dispatch/time.h"
#include "dispatch/uptime.h"
