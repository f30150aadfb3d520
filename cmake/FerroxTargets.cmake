# What all targets share: warnings, sanitizers, 64-bit file offsets, ccache.

find_program(FERROX_CCACHE ccache)
if(FERROX_CCACHE AND NOT CMAKE_CXX_COMPILER_LAUNCHER)
  set(CMAKE_C_COMPILER_LAUNCHER ${FERROX_CCACHE})
  set(CMAKE_CXX_COMPILER_LAUNCHER ${FERROX_CCACHE})
endif()

add_library(ferrox_options INTERFACE)
target_compile_definitions(ferrox_options INTERFACE _FILE_OFFSET_BITS=64 _TIME_BITS=64)
target_compile_options(ferrox_options INTERFACE -Wall -Wextra -Wshadow -Wnon-virtual-dtor -Woverloaded-virtual -Wvla)
if(CMAKE_CXX_COMPILER_ID STREQUAL Clang)
  target_compile_options(ferrox_options INTERFACE -Wthread-safety -Werror=thread-safety)
endif()
if(FERROX_WERROR)
  target_compile_options(ferrox_options INTERFACE -Werror)
endif()
if(FERROX_SANITIZE)
  target_compile_options(ferrox_options INTERFACE -fsanitize=${FERROX_SANITIZE} -fno-omit-frame-pointer
                                                  -fno-sanitize-recover=all)
  target_link_options(ferrox_options INTERFACE -fsanitize=${FERROX_SANITIZE})
endif()
