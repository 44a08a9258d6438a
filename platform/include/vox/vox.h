#pragma once

// Everything of Vox: values, connections, listeners, taps and service processes.
#include "vox/connection.h"
#include "vox/limits.h"
#include "vox/listener.h"
#include "vox/service.h"
#include "vox/tap.h"
#include "vox/value.h"
