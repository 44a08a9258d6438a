# The components, lowest level first. See style notes in HACKING.md.

pelorin_component(base LEVEL 0 LIBRARY platform
  HEADERS
    include/Pelorin
    include/plr/base/assert.h
    include/plr/base/export.h
    include/plr/base/report.h
    include/plr/base/ring_buffer_inline.h
    include/plr/base/thread_annotations.h
  SOURCES
    src/base/assert.cpp
    src/base/brief_mutex.h
    src/base/debug_print.cpp
    src/base/magazines.h
    src/base/report.cpp)

pelorin_component(dispatch LEVEL 1 LIBRARY platform
  HEADERS
    platform/include/dispatch/block.h
    platform/include/dispatch/calendar.h
    platform/include/dispatch/diagnostics.h
    platform/include/dispatch/dispatch.h
    platform/include/dispatch/group.h
    platform/include/dispatch/main_queue.h
    platform/include/dispatch/pump.h
    platform/include/dispatch/queue.h
    platform/include/dispatch/source.h
    platform/include/dispatch/time.h
    platform/include/dispatch/uptime.h
  SOURCES
    platform/linux/dispatch/activity.h
    platform/linux/dispatch/calendar.cpp
    platform/linux/dispatch/deputy.cpp
    platform/linux/dispatch/deputy.h
    platform/linux/dispatch/detached_thread.h
    platform/linux/dispatch/dump.cpp
    platform/linux/dispatch/fork.cpp
    platform/linux/dispatch/fork.h
    platform/linux/dispatch/futex.h
    platform/linux/dispatch/group.cpp
    platform/linux/dispatch/io_watch.h
    platform/linux/dispatch/item_store.cpp
    platform/linux/dispatch/latency.cpp
    platform/linux/dispatch/latency.h
    platform/linux/dispatch/poller.cpp
    platform/linux/dispatch/poller.h
    platform/linux/dispatch/pool.cpp
    platform/linux/dispatch/pool.h
    platform/linux/dispatch/pool_relief.cpp
    platform/linux/dispatch/pump.cpp
    platform/linux/dispatch/pump_core.cpp
    platform/linux/dispatch/pump_core.h
    platform/linux/dispatch/queue.cpp
    platform/linux/dispatch/queue_cells.cpp
    platform/linux/dispatch/queue_cells.h
    platform/linux/dispatch/queue_core.cpp
    platform/linux/dispatch/queue_core.h
    platform/linux/dispatch/queue_inspection.cpp
    platform/linux/dispatch/queue_life.cpp
    platform/linux/dispatch/queue_specific.cpp
    platform/linux/dispatch/queue_sync.cpp
    platform/linux/dispatch/run_list.h
    platform/linux/dispatch/source.cpp
    platform/linux/dispatch/source_core.cpp
    platform/linux/dispatch/source_core.h
    platform/linux/dispatch/spin_lock.h
    platform/linux/dispatch/time.cpp
    platform/linux/dispatch/timer_queue.cpp
    platform/linux/dispatch/timer_queue.h
    platform/linux/dispatch/timer_wheel.cpp
    platform/linux/dispatch/timer_wheel.h
    platform/linux/dispatch/uptime.cpp
    platform/linux/dispatch/watchdog.cpp)

# Need GLib and libsystemd, which their users bring; no other header includes them.
pelorin_component(dispatch_loops LEVEL 1 LIBRARY platform
  HEADERS
    platform/include/dispatch/glib.h
    platform/include/dispatch/sd_event.h)

pelorin_component(platform_common LEVEL 1 LIBRARY platform
  SOURCES
    platform/linux/common/description.cpp
    platform/linux/common/description.h
    platform/linux/common/key_index.cpp
    platform/linux/common/key_index.h)

pelorin_component(vox_values LEVEL 1 LIBRARY platform
  HEADERS
    platform/include/vox/value.h
  SOURCES
    platform/linux/vox/array.cpp
    platform/linux/vox/byte_buffer.h
    platform/linux/vox/bytes.cpp
    platform/linux/vox/cbor.h
    platform/linux/vox/codec.h
    platform/linux/vox/decode.cpp
    platform/linux/vox/description.cpp
    platform/linux/vox/descriptor.cpp
    platform/linux/vox/destroy.cpp
    platform/linux/vox/dictionary.cpp
    platform/linux/vox/encode.cpp
    platform/linux/vox/equal.cpp
    platform/linux/vox/error.cpp
    platform/linux/vox/utf8.cpp
    platform/linux/vox/value.cpp
    platform/linux/vox/value_layout.h)

pelorin_component(vox_connections LEVEL 1 LIBRARY platform
  HEADERS
    platform/include/vox/connection.h
    platform/include/vox/limits.h
    platform/include/vox/listener.h
    platform/include/vox/service.h
    platform/include/vox/tap.h
    platform/include/vox/vox.h
  SOURCES
    platform/linux/vox/admission.cpp
    platform/linux/vox/admission.h
    platform/linux/vox/complaint.cpp
    platform/linux/vox/complaint.h
    platform/linux/vox/connection.cpp
    platform/linux/vox/connection.h
    platform/linux/vox/connection_api.cpp
    platform/linux/vox/endpoint.cpp
    platform/linux/vox/endpoint.h
    platform/linux/vox/frame.cpp
    platform/linux/vox/frame.h
    platform/linux/vox/frame_reader.cpp
    platform/linux/vox/frame_reader.h
    platform/linux/vox/hello.cpp
    platform/linux/vox/hello.h
    platform/linux/vox/id_table.cpp
    platform/linux/vox/id_table.h
    platform/linux/vox/idle_exit.cpp
    platform/linux/vox/idle_exit.h
    platform/linux/vox/limits.cpp
    platform/linux/vox/limits.h
    platform/linux/vox/listener.cpp
    platform/linux/vox/listener.h
    platform/linux/vox/listener_api.cpp
    platform/linux/vox/listener_idle.cpp
    platform/linux/vox/lock.h
    platform/linux/vox/names.cpp
    platform/linux/vox/names.h
    platform/linux/vox/notify.cpp
    platform/linux/vox/now.h
    platform/linux/vox/output.cpp
    platform/linux/vox/output.h
    platform/linux/vox/passed_sockets.cpp
    platform/linux/vox/passed_sockets.h
    platform/linux/vox/peer_connection.cpp
    platform/linux/vox/peer_connection.h
    platform/linux/vox/peer_idle.cpp
    platform/linux/vox/peer_identity.cpp
    platform/linux/vox/peer_identity.h
    platform/linux/vox/peer_input.cpp
    platform/linux/vox/peer_limits.cpp
    platform/linux/vox/peer_requests.cpp
    platform/linux/vox/peer_send.cpp
    platform/linux/vox/peer_tap.cpp
    platform/linux/vox/peer_write.cpp
    platform/linux/vox/read_memory.cpp
    platform/linux/vox/read_memory.h
    platform/linux/vox/request.h
    platform/linux/vox/send_turn.cpp
    platform/linux/vox/send_turn.h
    platform/linux/vox/service_account.cpp
    platform/linux/vox/service_account.h
    platform/linux/vox/service_socket.cpp
    platform/linux/vox/service_socket.h
    platform/linux/vox/socket_io.cpp
    platform/linux/vox/socket_io.h
    platform/linux/vox/tap_hub.cpp
    platform/linux/vox/tap_hub.h
    platform/linux/vox/transactions.cpp
    platform/linux/vox/transactions.h
    platform/linux/vox/user_turns.cpp
    platform/linux/vox/user_turns.h)

pelorin_component(qf_core LEVEL 1 LIBRARY platform
  HEADERS
    platform/include/qf/base.h
    platform/include/qf/collection.h
    platform/include/qf/data.h
    platform/include/qf/date.h
    platform/include/qf/error.h
    platform/include/qf/preferences.h
    platform/include/qf/qf.h
    platform/include/qf/scalar.h
    platform/include/qf/string.h
    platform/include/qf/vox_bridge.h
  SOURCES
    platform/linux/qf/array.cpp
    platform/linux/qf/data.cpp
    platform/linux/qf/date.cpp
    platform/linux/qf/date_formatter.cpp
    platform/linux/qf/description.cpp
    platform/linux/qf/destroy.cpp
    platform/linux/qf/dictionary.cpp
    platform/linux/qf/equal.cpp
    platform/linux/qf/error.cpp
    platform/linux/qf/number.cpp
    platform/linux/qf/string.cpp
    platform/linux/qf/string_encoding.cpp
    platform/linux/qf/string_number.cpp
    platform/linux/qf/url.cpp
    platform/linux/qf/value.cpp
    platform/linux/qf/value.h
    platform/linux/qf/vox_bridge.cpp)
if(PELORIN_CHECKS)
  target_compile_definitions(component_qf_core PRIVATE PELORIN_CHECKS=1)  # counts values alive
endif()

pelorin_component(qf_preferences LEVEL 1 LIBRARY platform
  SOURCES
    platform/linux/qf/preferences.cpp
    platform/linux/qf/preferences_base64.cpp
    platform/linux/qf/preferences_base64.h
    platform/linux/qf/preferences_cache.cpp
    platform/linux/qf/preferences_cache.h
    platform/linux/qf/preferences_edit.cpp
    platform/linux/qf/preferences_edit.h
    platform/linux/qf/preferences_file.cpp
    platform/linux/qf/preferences_file.h
    platform/linux/qf/preferences_names.cpp
    platform/linux/qf/preferences_names.h
    platform/linux/qf/preferences_parse.cpp
    platform/linux/qf/preferences_parse.h
    platform/linux/qf/preferences_save.cpp
    platform/linux/qf/preferences_save.h
    platform/linux/qf/preferences_scan.cpp
    platform/linux/qf/preferences_scan.h
    platform/linux/qf/preferences_store.cpp
    platform/linux/qf/preferences_store.h
    platform/linux/qf/preferences_values.cpp
    platform/linux/qf/preferences_values.h
    platform/linux/qf/preferences_watch.cpp
    platform/linux/qf/preferences_watch.h
    platform/linux/qf/preferences_write.cpp
    platform/linux/qf/preferences_write.h)

pelorin_component(trel LEVEL 1 LIBRARY platform
  HEADERS
    platform/include/trel/trel.h
  SOURCES
    platform/linux/trel/trel.cpp)

pelorin_component(ob LEVEL 1 LIBRARY platform
  HEADERS
    platform/include/ob/ob.h
  SOURCES
    platform/linux/ob/format.cpp
    platform/linux/ob/object.cpp
    platform/linux/ob/object.h)

pelorin_component(kel LEVEL 1 LIBRARY platform
  HEADERS
    platform/include/kel/kel.h
  SOURCES
    platform/linux/kel/backlog.cpp
    platform/linux/kel/backlog.h
    platform/linux/kel/client.cpp
    platform/linux/kel/client.h
    platform/linux/kel/destination.cpp
    platform/linux/kel/destination.h
    platform/linux/kel/escape.cpp
    platform/linux/kel/escape.h
    platform/linux/kel/kel.cpp
    platform/linux/kel/lock.h
    platform/linux/kel/message.cpp
    platform/linux/kel/message.h
    platform/linux/kel/native.cpp
    platform/linux/kel/native.h
    platform/linux/kel/record.cpp
    platform/linux/kel/record.h
    platform/linux/kel/send_now.cpp
    platform/linux/kel/sender.cpp
    platform/linux/kel/sender.h
    platform/linux/kel/socket_io.cpp
    platform/linux/kel/socket_io.h)

pelorin_component(serial LEVEL 1 LIBRARY platform
  HEADERS
    platform/include/serial/serial.h
  SOURCES
    platform/linux/serial/baud.cpp
    platform/linux/serial/bytes.cpp
    platform/linux/serial/port.cpp
    platform/linux/serial/settings.cpp
    platform/linux/serial/wake.cpp)

pelorin_component(format_core LEVEL 1 LIBRARY pelorin
  HEADERS
    include/plr/format/binary.h
    include/plr/format/bitfield.h
    include/plr/format/byte_dump.h
    include/plr/format/flag_names.h
    include/plr/format/hex.h
    include/plr/format/integer.h
    include/plr/format/rle.h
  SOURCES
    src/format/binary.cpp
    src/format/bitfield.cpp
    src/format/byte_dump.cpp
    src/format/flag_names.cpp
    src/format/flat_dump.cpp
    src/format/flat_hex.cpp
    src/format/hex.cpp
    src/format/hex_avx2.cpp
    src/format/hex_kernel.cpp
    src/format/hex_kernel.h
    src/format/hex_neon.cpp
    src/format/hex_plain.cpp
    src/format/hex_vector.h
    src/format/rle.cpp)

pelorin_component(ipc_values LEVEL 2 LIBRARY pelorin
  HEADERS
    include/plr/ipc/array.h
    include/plr/ipc/auto_reply.h
    include/plr/ipc/connection.h
    include/plr/ipc/dict.h
    include/plr/ipc/listener.h
    include/plr/ipc/object.h
    include/plr/ipc/read.h
    include/plr/ipc/values.h
  SOURCES
    src/ipc/auto_reply.cpp
    src/ipc/connection.cpp
    src/ipc/listener.cpp
    src/ipc/object.cpp
    src/ipc/object_to_string.cpp
    src/ipc/read.cpp)

pelorin_component(concurrency_core LEVEL 2 LIBRARY pelorin
  HEADERS
    include/plr/concurrency/async_dispatch_callback.h
    include/plr/concurrency/clock.h
    include/plr/concurrency/monitor.h
    include/plr/concurrency/priority_queue.h
    include/plr/concurrency/qf_shared_ref.h
    include/plr/concurrency/queue_role.h
    include/plr/concurrency/shared_ref.h
    include/plr/concurrency/shared_synchronizable.h
    include/plr/concurrency/while_alive.h
  SOURCES
    src/concurrency/async_dispatch_callback.cpp
    src/concurrency/clock.cpp
    src/concurrency/monitor.cpp
    src/concurrency/priority_queue.cpp)

pelorin_component(log_values LEVEL 2 LIBRARY pelorin
  HEADERS
    include/plr/log/log_level.h
    include/plr/log/log_message.h
    include/plr/log/log_message_buffer.h
    include/plr/log/log_tag.h
  SOURCES
    src/log/log_level.cpp
    src/log/log_message.cpp
    src/log/log_message_lock.h
    src/log/log_message_buffer.cpp
    src/log/log_tag.cpp)

pelorin_component(io LEVEL 2 LIBRARY pelorin
  HEADERS
    include/plr/io/memory_mapped_file.h
  SOURCES
    src/io/descriptor.cpp
    src/io/descriptor_transport.cpp
    src/io/descriptor_transport.h
    src/io/fd_transport.cpp
    src/io/file_transport.cpp
    src/io/memory_mapped_file.cpp
    src/io/ring_buffer.cpp
    src/io/secret_mask.cpp
    src/io/secret_mask.h
    src/io/tap_transport.cpp
    src/io/timed_uart.cpp
    src/io/timed_uart.h
    src/io/timed_uart_connection.cpp
    src/io/timed_uart_workers.cpp
    src/io/transport.cpp
    src/io/uart_settings.cpp
    src/io/uart_settings.h
    src/io/uart_timeout_transport.cpp
    src/io/uart_transport.cpp
    src/io/wait_mutex.h)

pelorin_component(log_core LEVEL 3 LIBRARY pelorin
  HEADERS
    include/plr/log/console_log_writer.h
    include/plr/log/crash_drain.h
    include/plr/log/file_log_writer.h
    include/plr/log/kel_log_writer.h
    include/plr/log/log_server.h
    include/plr/log/log_writer.h
    include/plr/log/logger.h
    include/plr/log/logger_base.h
    include/plr/log/logger_common_base.h
    include/plr/log/logger_tree.h
    include/plr/log/memory_buffered_log_writer.h
    include/plr/log/scoped_log_flusher.h
    include/plr/log/staged_logger.h
    include/plr/log/static_logger.h
    include/plr/log/tracked_logger.h
    include/plr/log/trel_context.h
  SOURCES
    src/log/console_device.cpp
    src/log/console_device.h
    src/log/console_log_writer.cpp
    src/log/crash_drain.cpp
    src/log/crash_drain.h
    src/log/crash_sink.h
    src/log/file_log_writer.cpp
    src/log/kel_log_writer.cpp
    src/log/level_table.cpp
    src/log/level_table.h
    src/log/log_delivery.cpp
    src/log/log_delivery.h
    src/log/log_forks.cpp
    src/log/log_forks.h
    src/log/log_file.cpp
    src/log/log_file.h
    src/log/log_server.cpp
    src/log/log_writer.cpp
    src/log/logger.cpp
    src/log/logger_base.cpp
    src/log/logger_common_base.cpp
    src/log/logger_tree.cpp
    src/log/memory_buffered_log_writer.cpp
    src/log/record_buffer.cpp
    src/log/record_buffer.h
    src/log/record_format.h
    src/log/record_output.cpp
    src/log/record_output.h
    src/log/record_text.cpp
    src/log/record_text.h
    src/log/record_writer.h
    src/log/scoped_log_flusher.cpp
    src/log/signal_block.h
    src/log/staged_logger.cpp
    src/log/static_logger.cpp
    src/log/time_text.cpp
    src/log/time_text.h
    src/log/tracked_logger.cpp)

pelorin_component(ipc_endpoints LEVEL 3 LIBRARY pelorin
  HEADERS
    include/plr/ipc/vox_client.h
    include/plr/ipc/vox_client_helper.h
    include/plr/ipc/vox_server.h
    include/plr/ipc/vox_server_helper.h
  SOURCES
    src/ipc/vox_client.cpp
    src/ipc/vox_client_helper.cpp
    src/ipc/vox_server.cpp
    src/ipc/vox_server_helper.cpp)

pelorin_component(ipc_assertion LEVEL 3 LIBRARY pelorin
  HEADERS
    include/plr/ipc/result.h
    include/plr/ipc/result_errors.h
    include/plr/ipc/vox_drosk_assertion.h
  SOURCES
    src/ipc/result_errors.cpp
    src/ipc/vox_drosk_assertion.cpp)

pelorin_component(qf_adapters LEVEL 3 LIBRARY pelorin
  HEADERS
    include/plr/ob/auto_pool.h
    include/plr/qf/assign.h
    include/plr/qf/assign_loosely.h
    include/plr/qf/convert_copy.h
    include/plr/qf/dict_adapter.h
    include/plr/qf/make_qf_string.h
    include/plr/qf/map_adapter.h
    include/plr/qf/plist_adapter.h
    include/plr/qf/show.h
  SOURCES
    src/ob/auto_pool.cpp
    src/qf/assign.cpp
    src/qf/assign_loosely.cpp
    src/qf/convert_copy.cpp
    src/qf/dict_adapter.cpp
    src/qf/map_adapter.cpp
    src/qf/plist_adapter.cpp
    src/qf/show.cpp)

pelorin_component(ipc_qf_bridge LEVEL 3 LIBRARY pelorin
  HEADERS
    include/plr/ipc/qf_bridge.h
  SOURCES
    src/ipc/qf_bridge.cpp)

pelorin_component(format_log LEVEL 4 LIBRARY pelorin
  HEADERS
    include/plr/format/bitfield_log.h
  SOURCES
    src/format/bitfield_log.cpp)

pelorin_component(log_loggable LEVEL 4 LIBRARY pelorin
  HEADERS
    include/plr/log/loggable.h
    include/plr/log/shared_loggable.h)

# Needs {fmt}, which its users bring; no other header includes it.
pelorin_component(log_fmt LEVEL 3 LIBRARY pelorin
  HEADERS
    include/plr/log/fmt.h)

pelorin_component(rest_message LEVEL 4 LIBRARY pelorin
  HEADERS
    include/plr/rest/assertion_state.h
    include/plr/rest/auto_reply.h
    include/plr/rest/map_change.h
    include/plr/rest/message.h
    include/plr/rest/operation.h
    include/plr/rest/path_map.h
    include/plr/rest/typed_value.h
    include/plr/rest/value_coding.h
  SOURCES
    src/rest/assertion_state.cpp
    src/rest/auto_reply.cpp
    src/rest/map_change.cpp
    src/rest/message.cpp
    src/rest/operation.cpp
    src/rest/typed_value.cpp
    src/rest/value_coding.cpp)

pelorin_component(log_remote LEVEL 5 LIBRARY pelorin
  HEADERS
    include/plr/log/vox_log_server.h
    include/plr/log/vox_logger.h
    include/plr/log/vox_logger_proxy.h
  SOURCES
    src/log/remote_log_buffer.cpp
    src/log/remote_log_buffer.h
    src/log/remote_log_format.cpp
    src/log/remote_log_format.h
    src/log/remote_log_sender.cpp
    src/log/remote_log_sender.h
    src/log/vox_log_server.cpp
    src/log/vox_logger.cpp
    src/log/vox_logger_proxy.cpp)

pelorin_component(timers LEVEL 5 LIBRARY pelorin
  HEADERS
    include/plr/concurrency/dispatch_timer.h
    include/plr/concurrency/dispatch_timer_service.h
    include/plr/concurrency/timer.h
    include/plr/concurrency/timer_delay.h
    include/plr/concurrency/timer_service.h
  SOURCES
    src/concurrency/dispatch_timer.cpp
    src/concurrency/dispatch_timer_service.cpp
    src/concurrency/timer_service.cpp)

pelorin_component(text LEVEL 5 LIBRARY pelorin
  HEADERS
    include/plr/text/alpha_identifier.h
    include/plr/text/cell_broadcast.h
    include/plr/text/gsm7.h
    include/plr/text/octet_source_buffer.h
    include/plr/text/sms_encoding.h
    include/plr/text/sms_user_data.h
    include/plr/text/text_converter.h
    include/plr/text/text_transform.h
    include/plr/text/ussd_text.h
  SOURCES
    src/text/alpha_identifier.cpp
    src/text/cell_broadcast.cpp
    src/text/combining_marks.h
    src/text/conversion_chain.cpp
    src/text/conversion_chain.h
    src/text/grapheme_joins.cpp
    src/text/grapheme_joins.h
    src/text/sms_encoding.cpp
    src/text/sms_header.cpp
    src/text/sms_header.h
    src/text/sms_layout.h
    src/text/sms_text.cpp
    src/text/sms_text.h
    src/text/sms_user_data.cpp
    src/text/ussd_text.cpp
    src/text/euc_kr.cpp
    src/text/euc_kr.h
    src/text/euc_kr_table.h
    src/text/data_coding_scheme.cpp
    src/text/hex_transforms.cpp
    src/text/hex_transforms.h
    src/text/gsm7.cpp
    src/text/gsm7_alphabets.h
    src/text/gsm7_stages.cpp
    src/text/gsm7_stages.h
    src/text/gsm7_tables.cpp
    src/text/gsm7_tables.h
    src/text/octet_pull.h
    src/text/octet_source_buffer.cpp
    src/text/octet_transforms.cpp
    src/text/octet_transforms.h
    src/text/octets.h
    src/text/plain_transforms.h
    src/text/read_chars.cpp
    src/text/septet_stages.cpp
    src/text/septet_stages.h
    src/text/stage.h
    src/text/stage_factory.cpp
    src/text/stage_factory.h
    src/text/text_converter.cpp
    src/text/text_counts.cpp
    src/text/text_transform.cpp
    src/text/ucs2_to_utf8_transform.cpp
    src/text/ucs2_to_utf8_transform.h
    src/text/unit_pull.h
    src/text/utf16.h
    src/text/utf8_avx2.cpp
    src/text/utf8_decoder.cpp
    src/text/utf8_decoder.h
    src/text/utf8_kernel.cpp
    src/text/utf8_kernel.h
    src/text/utf8_plain.cpp
    src/text/utf8_plain.h
    src/text/utf8_to_ucs2_transform.cpp
    src/text/utf8_to_ucs2_transform.h)

pelorin_component(rest_tree LEVEL 5 LIBRARY pelorin
  HEADERS
    include/plr/rest/access_guard.h
    include/plr/rest/access_rules.h
    include/plr/rest/connection_resource.h
    include/plr/rest/connector_server.h
    include/plr/rest/context_delegater.h
    include/plr/rest/description_resource.h
    include/plr/rest/path_reach.h
    include/plr/rest/path_view.h
    include/plr/rest/reply_dict_context.h
    include/plr/rest/resource.h
    include/plr/rest/resource_connection.h
    include/plr/rest/resource_context.h
    include/plr/rest/rest_server_example.h
    include/plr/rest/server_base.h
    include/plr/rest/tree_resource.h
    include/plr/rest/watcher_cleanup.h
  SOURCES
    src/rest/access_guard.cpp
    src/rest/access_rules.cpp
    src/rest/connection_resource.cpp
    src/rest/description_resource.cpp
    src/rest/path_reach.cpp
    src/rest/path_view.cpp
    src/rest/reply_dict_context.cpp
    src/rest/resource.cpp
    src/rest/resource_connection.cpp
    src/rest/resource_context.cpp
    src/rest/rest_server_example.cpp
    src/rest/tree_resource.cpp)

pelorin_component(rest_client LEVEL 5 LIBRARY pelorin
  HEADERS
    include/plr/rest/assertion_handle.h
    include/plr/rest/assertion_provider.h
    include/plr/rest/reconnect_policy.h
    include/plr/rest/rest_module.h
    include/plr/rest/rest_module_state.h
    include/plr/rest/vox_connector.h
  SOURCES
    src/rest/assertion_handle.cpp
    src/rest/assertion_provider.cpp
    src/rest/reconnect_policy.cpp
    src/rest/rest_module.cpp
    src/rest/rest_module_state.cpp
    src/rest/vox_connector.cpp)

pelorin_component(rest_resources LEVEL 6 LIBRARY pelorin
  HEADERS
    include/plr/rest/assertion_resource.h
    include/plr/rest/map_resource.h
    include/plr/rest/property_resource.h
    include/plr/rest/request_resource.h
    include/plr/rest/watchable.h
  SOURCES
    src/rest/assertion_resource.cpp
    src/rest/map_resource.cpp
    src/rest/notify.h
    src/rest/property_path.cpp
    src/rest/property_path.h
    src/rest/property_resource.cpp
    src/rest/request_provider.cpp
    src/rest/request_provider.h
    src/rest/request_resource.cpp
    src/rest/value_part.h
    src/rest/watchable.cpp)

pelorin_component(umbrella LEVEL 9 LIBRARY pelorin
  HEADERS
    include/plr/concurrency.h
    include/plr/format.h
    include/plr/ipc.h
    include/plr/log.h
    include/plr/plr.h
    include/plr/qf.h
    include/plr/rest.h
    include/plr/text.h)

# For users' tests, and our own: a library by itself, on top of all the others.
pelorin_component(test LEVEL 10 LIBRARY test
  HEADERS
    include/plr/test.h
    include/plr/test/fake_rest.h
    include/plr/test/fake_transport.h
    include/plr/test/faulty_transport.h
    include/plr/test/manual_calendar.h
    include/plr/test/manual_clock.h
    include/plr/test/modem_script.h
    include/plr/test/recording_log_writer.h
    include/plr/test/scripted_modem.h
    include/plr/test/virtual_time.h
    include/plr/test/vox_peer.h
    include/plr/test/waiting.h
  SOURCES
    src/test/faulty_transport.cpp
    src/test/modem_script.cpp
    src/test/scripted_modem.cpp
    src/test/virtual_time.cpp
    src/test/vox_peer.cpp)

# With names of their own that others of their component have, too: not compiled together.
set_source_files_properties(
  platform/linux/dispatch/pump_core.cpp platform/linux/dispatch/queue_core.cpp platform/linux/dispatch/timer_queue.cpp
  platform/linux/qf/dictionary.cpp platform/linux/qf/preferences_write.cpp platform/linux/qf/url.cpp
  platform/linux/serial/baud.cpp
  platform/linux/vox/dictionary.cpp platform/linux/vox/listener_api.cpp
  src/io/tap_transport.cpp src/io/uart_timeout_transport.cpp src/io/uart_transport.cpp src/log/crash_drain.cpp
  src/rest/map_resource.cpp src/rest/property_path.cpp src/rest/property_resource.cpp
  src/rest/request_resource.cpp
  src/text/gsm7_stages.cpp src/text/octet_transforms.cpp src/text/read_chars.cpp src/text/ussd_text.cpp
  PROPERTIES SKIP_UNITY_BUILD_INCLUSION ON)
