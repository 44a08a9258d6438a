#pragma once

// Text conversion for SMS, USSD and cell broadcast.
#include "plr/text/alpha_identifier.h"
#include "plr/text/cell_broadcast.h"
#include "plr/text/gsm7.h"
#include "plr/text/octet_source_buffer.h"
#include "plr/text/sms_encoding.h"
#include "plr/text/sms_user_data.h"
#include "plr/text/text_converter.h"
#include "plr/text/text_transform.h"
#include "plr/text/ussd_text.h"
