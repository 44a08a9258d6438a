# The components, lowest level first. See style notes in HACKING.md.

pelorin_component(base LEVEL 0 LIBRARY platform
  HEADERS
    include/plr/base/assert.h
    include/plr/base/export.h
    include/plr/base/report.h
    include/plr/base/thread_annotations.h
  SOURCES
    src/base/assert.cpp
    src/base/report.cpp)

pelorin_component(dispatch LEVEL 1 LIBRARY platform
  HEADERS
    platform/include/dispatch/block.h
    platform/include/dispatch/dispatch.h
    platform/include/dispatch/group.h
    platform/include/dispatch/queue.h
    platform/include/dispatch/source.h
    platform/include/dispatch/time.h
  SOURCES
    platform/linux/dispatch/deputy.cpp
    platform/linux/dispatch/deputy.h
    platform/linux/dispatch/futex.h
    platform/linux/dispatch/group.cpp
    platform/linux/dispatch/io_watch.h
    platform/linux/dispatch/item_store.cpp
    platform/linux/dispatch/poller.cpp
    platform/linux/dispatch/poller.h
    platform/linux/dispatch/pool.cpp
    platform/linux/dispatch/pool.h
    platform/linux/dispatch/queue.cpp
    platform/linux/dispatch/queue_core.cpp
    platform/linux/dispatch/queue_core.h
    platform/linux/dispatch/run_list.h
    platform/linux/dispatch/source.cpp
    platform/linux/dispatch/spin_lock.h
    platform/linux/dispatch/time.cpp
    platform/linux/dispatch/timer_queue.cpp
    platform/linux/dispatch/timer_queue.h)

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
    platform/linux/vox/key_index.cpp
    platform/linux/vox/key_index.h
    platform/linux/vox/utf8.cpp
    platform/linux/vox/value.cpp
    platform/linux/vox/value_layout.h)
