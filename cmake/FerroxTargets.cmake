# What all targets share: warnings, sanitizers, 64-bit file offsets, ccache.

find_program(FERROX_CCACHE ccache)
if(FERROX_CCACHE AND NOT CMAKE_CXX_COMPILER_LAUNCHER)
  # Without these, what uses precompiled headers is not cached: their macros and times of change are then to be ignored.
  set(launcher ${CMAKE_COMMAND} -E env CCACHE_SLOPPINESS=pch_defines,time_macros ${FERROX_CCACHE})
  set(CMAKE_C_COMPILER_LAUNCHER ${launcher})
  set(CMAKE_CXX_COMPILER_LAUNCHER ${launcher})
endif()

add_library(ferrox_options INTERFACE)
# The last of each is what pkg-config gives for some libraries; for all, so that precompiled headers fit all.
target_compile_definitions(ferrox_options INTERFACE _FILE_OFFSET_BITS=64 _TIME_BITS=64 _LARGEFILE64_SOURCE)
target_compile_options(ferrox_options INTERFACE -Wall -Wextra -Wshadow -Wnon-virtual-dtor -Woverloaded-virtual -Wvla
                                                -pthread)
if(CMAKE_CXX_COMPILER_ID STREQUAL Clang)
  target_compile_options(ferrox_options INTERFACE -Wthread-safety -Werror=thread-safety)
endif()
if(FERROX_FAST_BUILD)
  # Programs are compiled with the flags of libraries: so they can take the same compiled headers.
  set(CMAKE_CXX_COMPILE_OPTIONS_PIE ${CMAKE_CXX_COMPILE_OPTIONS_PIC})
endif()
if(FERROX_FAST_BUILD AND CMAKE_CXX_COMPILER_ID STREQUAL GNU)
  # GCC 12 takes what std::string copies within itself for out of bounds. It keeps silent where the code is a system
  # header's, which it forgets of a precompiled one; the presets without these keep the warnings.
  target_compile_options(ferrox_options INTERFACE -Wno-array-bounds -Wno-restrict -Wno-stringop-overflow
                                                  -Wno-stringop-overread)
  # Sources compiled as one count as headers, of which other sources might see another anonymous namespace.
  target_compile_options(ferrox_options INTERFACE -Wno-subobject-linkage)
endif()
if(FERROX_WERROR)
  target_compile_options(ferrox_options INTERFACE -Werror)
endif()
if(FERROX_SANITIZE)
  target_compile_definitions(ferrox_options INTERFACE FERROX_SANITIZED)  # for tests of what sanitizers change
  target_compile_options(ferrox_options INTERFACE -fsanitize=${FERROX_SANITIZE} -fno-omit-frame-pointer
                                                  -fno-sanitize-recover=all)
  target_link_options(ferrox_options INTERFACE -fsanitize=${FERROX_SANITIZE})
endif()
