# Installs the build tree BUILD under WORK/first, then moves the tree to WORK/moved, where the tests look for it.
#   cmake -DBUILD= -DWORK= -P install.cmake
cmake_minimum_required(VERSION 3.25)
file(REMOVE_RECURSE ${WORK})
execute_process(COMMAND ${CMAKE_COMMAND} --install ${BUILD} --prefix ${WORK}/first
  COMMAND_ERROR_IS_FATAL ANY OUTPUT_QUIET)
file(RENAME ${WORK}/first ${WORK}/moved)

file(GLOB_RECURSE texts ${WORK}/moved/*.cmake ${WORK}/moved/*.pc ${WORK}/moved/*.h ${WORK}/moved/*.hpp)
list(LENGTH texts count)
if(count LESS 15)
  message(FATAL_ERROR "only ${count} headers and package files were installed")
endif()
foreach(text IN LISTS texts)
  file(STRINGS ${text} lines)
  string(FIND "${lines}" "${WORK}/first" at)
  string(FIND "${lines}" "${BUILD}" at_build)
  if(at GREATER -1 OR at_build GREATER -1)
    message(FATAL_ERROR "${text} knows where it was built or installed")
  endif()
endforeach()
