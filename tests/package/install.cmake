# Installs the build tree BUILD under WORK/first, then moves the tree to WORK/moved, where the tests look for it.
#   cmake -DBUILD= -DWORK= -P install.cmake
cmake_minimum_required(VERSION 3.25)
file(REMOVE_RECURSE ${WORK})
execute_process(COMMAND ${CMAKE_COMMAND} --install ${BUILD} --prefix ${WORK}/first
  COMMAND_ERROR_IS_FATAL ANY OUTPUT_QUIET)
file(RENAME ${WORK}/first ${WORK}/moved)
