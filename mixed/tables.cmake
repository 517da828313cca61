# What reads a table and a formula, and makes their model. The fuzzer compiles these files for itself, and so they
# are to need no others.
set(QXMIXED_TABLE_SOURCES
  ${CMAKE_CURRENT_LIST_DIR}/alias_groups.cpp
  ${CMAKE_CURRENT_LIST_DIR}/aliasing.cpp
  ${CMAKE_CURRENT_LIST_DIR}/aliasing_sparse.cpp
  ${CMAKE_CURRENT_LIST_DIR}/coding.cpp
  ${CMAKE_CURRENT_LIST_DIR}/csv.cpp
  ${CMAKE_CURRENT_LIST_DIR}/design.cpp
  ${CMAKE_CURRENT_LIST_DIR}/error.cpp
  ${CMAKE_CURRENT_LIST_DIR}/expression.cpp
  ${CMAKE_CURRENT_LIST_DIR}/formula.cpp
  ${CMAKE_CURRENT_LIST_DIR}/frame.cpp
  ${CMAKE_CURRENT_LIST_DIR}/lexer.cpp
  ${CMAKE_CURRENT_LIST_DIR}/new_rows.cpp
  ${CMAKE_CURRENT_LIST_DIR}/random_terms.cpp
  ${CMAKE_CURRENT_LIST_DIR}/syntax.cpp
  ${CMAKE_CURRENT_LIST_DIR}/table.cpp
  ${CMAKE_CURRENT_LIST_DIR}/term_algebra.cpp
  ${CMAKE_CURRENT_LIST_DIR}/text.cpp
  ${CMAKE_CURRENT_LIST_DIR}/variables.cpp
  ${CMAKE_CURRENT_LIST_DIR}/vectors.cpp
  ${CMAKE_CURRENT_LIST_DIR}/words.cpp)
