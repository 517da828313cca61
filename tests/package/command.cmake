# Solves MATRIX with the installed command PROGRAM, which has to find its libraries by itself.
#   cmake -DPROGRAM= -DMATRIX= -P command.cmake
cmake_minimum_required(VERSION 3.25)
unset(ENV{LD_LIBRARY_PATH})
execute_process(COMMAND ${PROGRAM} solve --json ${MATRIX} OUTPUT_VARIABLE answer COMMAND_ERROR_IS_FATAL ANY)
string(JSON order GET "${answer}" rows)
string(JSON rank GET "${answer}" rank)
string(JSON residual GET "${answer}" largest_residual)
if(NOT (order EQUAL 48 AND rank EQUAL 48 AND residual LESS 1e-14))
  message(FATAL_ERROR "order ${order}, rank ${rank}, residual ${residual}")
endif()
message(STATUS "order ${order}, rank ${rank}, residual ${residual}")
