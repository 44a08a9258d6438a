#pragma once

// Text conversion for SMS, USSD and cell broadcast.
#include "plr/text/octet_source_buffer.h"
#include "plr/text/text_converter.h"
#include "plr/text/text_transform.h"
