#pragma once

#include "qf/base.h"
#include "qf/collection.h"
#include "qf/data.h"
#include "qf/date.h"
#include "qf/error.h"
#include "qf/preferences.h"
#include "qf/scalar.h"
#include "qf/string.h"
#include "qf/vox_bridge.h"
