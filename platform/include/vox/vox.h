#pragma once

// Everything of Vox: values and connections.
#include "vox/connection.h"
#include "vox/value.h"
