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
