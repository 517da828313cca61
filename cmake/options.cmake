# Every switch of the build, and the compile options that all targets share (qxesm_options).
option(QXESM_WERROR "Treat warnings as errors" OFF)
option(QXESM_SANITIZE "AddressSanitizer and UndefinedBehaviorSanitizer" OFF)
option(QXESM_COVERAGE "Line and branch coverage (gcov)" OFF)
option(QXESM_BUILD_TESTS "Build the tests" ${PROJECT_IS_TOP_LEVEL})
option(QXESM_BUILD_CLI "Build the qxsm command" ON)
option(QXESM_BUILD_FUZZERS "Build the libFuzzer targets (clang only)" OFF)
option(QXESM_BUILD_BENCH "Build the benchmarks" OFF)

if(NOT CMAKE_BUILD_TYPE AND NOT CMAKE_CONFIGURATION_TYPES)
  set(CMAKE_BUILD_TYPE Release CACHE STRING "Build type" FORCE)
endif()
set(CMAKE_C_FLAGS_RELEASE "-O3 -DNDEBUG")
set(CMAKE_CXX_FLAGS_RELEASE "-O3 -DNDEBUG")

add_library(qxesm_options INTERFACE)
# The same bits on every CPU: no contraction of a*b + c into one rounding.
target_compile_options(qxesm_options INTERFACE -Wall -Wextra -Wconversion -Wshadow -ffp-contract=off)
# GCC's meaning of -Wconversion for C++, also where clang reads these flags (its own includes signs).
target_compile_options(qxesm_options INTERFACE $<$<COMPILE_LANGUAGE:CXX>:-Wno-sign-conversion>)
if(QXESM_WERROR)
  target_compile_options(qxesm_options INTERFACE -Werror)
endif()
if(QXESM_SANITIZE)
  # Test programs are not instrumented themselves, which would take most of the time of such a build; what they call is.
  define_property(TARGET PROPERTY PLAIN_CODE INITIALIZE_FROM_VARIABLE QXESM_PLAIN_CODE
    BRIEF_DOCS "Compile without the sanitizers")
  set(instrumented $<NOT:$<BOOL:$<TARGET_PROPERTY:PLAIN_CODE>>>)
  target_compile_options(qxesm_options INTERFACE
    "$<${instrumented}:-fno-omit-frame-pointer;-g1;-fsanitize=address,undefined;-fno-sanitize-recover=undefined>")
  target_link_options(qxesm_options INTERFACE -fsanitize=address,undefined)
endif()

# For code that calculates little: the checks of what is inlined into it would be most of its time to compile.
function(qxesm_few_inlined_checks target)
  if(QXESM_SANITIZE)
    target_compile_options(${target} PRIVATE -Og)
  endif()
endfunction()
if(QXESM_COVERAGE)
  target_compile_options(qxesm_options INTERFACE --coverage)
  target_link_options(qxesm_options INTERFACE --coverage)
endif()
