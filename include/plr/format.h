#pragma once

// Bytes, bits and integers as text, and back.
#include "plr/format/binary.h"
#include "plr/format/bitfield.h"
#include "plr/format/bitfield_log.h"
#include "plr/format/byte_dump.h"
#include "plr/format/flag_names.h"
#include "plr/format/hex.h"
#include "plr/format/rle.h"
