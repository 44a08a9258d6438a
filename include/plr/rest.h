#pragma once

// Resources at paths: servers, clients and their messages, and what they are
// made with: values, connections, queue-owning objects.
#include "plr/concurrency.h"
#include "plr/ipc.h"
#include "plr/rest/auto_reply.h"
#include "plr/rest/connection_resource.h"
#include "plr/rest/message.h"
#include "plr/rest/operation.h"
#include "plr/rest/path_view.h"
#include "plr/rest/property_resource.h"
#include "plr/rest/reply_dict_context.h"
#include "plr/rest/resource.h"
#include "plr/rest/resource_connection.h"
#include "plr/rest/resource_context.h"
#include "plr/rest/rest_module.h"
#include "plr/rest/rest_server_example.h"
#include "plr/rest/tree_resource.h"
#include "plr/rest/value_coding.h"
#include "plr/rest/vox_connector.h"
#include "plr/rest/watchable.h"
