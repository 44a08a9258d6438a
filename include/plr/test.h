#pragma once

// Everything of namespace plr::test: what tests of programs that use this library
// need, whatever test framework they have. Its own library, Pelorin::test.
#include "plr/test/fake_rest.h"
#include "plr/test/fake_transport.h"
#include "plr/test/faulty_transport.h"
#include "plr/test/manual_calendar.h"
#include "plr/test/manual_clock.h"
#include "plr/test/modem_script.h"
#include "plr/test/recording_log_writer.h"
#include "plr/test/scripted_modem.h"
#include "plr/test/virtual_time.h"
#include "plr/test/vox_peer.h"
#include "plr/test/waiting.h"
