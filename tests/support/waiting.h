#pragma once

#include <gtest/gtest.h>

#include "dispatch/dispatch.h"
#include "plr/test/waiting.h"
