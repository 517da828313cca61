# What the Matrix Market reader consists of. The fuzzer compiles these files for itself, and so they are to
# need no others.
set(QXSM_READER_SOURCES
  ${CMAKE_CURRENT_LIST_DIR}/bytes.cpp
  ${CMAKE_CURRENT_LIST_DIR}/error.cpp
  ${CMAKE_CURRENT_LIST_DIR}/fields.cpp
  ${CMAKE_CURRENT_LIST_DIR}/lines.cpp
  ${CMAKE_CURRENT_LIST_DIR}/matrix_market.cpp
  ${CMAKE_CURRENT_LIST_DIR}/matrix_market_header.cpp)
