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
