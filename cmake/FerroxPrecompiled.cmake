# The headers of others that nearly every source includes, compiled once: reading them is half of the time that our
# short sources take. No source may rely on it: each includes what it needs, and the builds without this check that.
option(FERROX_PRECOMPILE "Compile the headers of the standard library and JsonCpp once" OFF)

set(ferrox_common_headers <algorithm> <array> <atomic> <cerrno> <chrono> <condition_variable> <cstdint> <cstdio> <cstring>
    <functional> <map> <memory> <mutex> <optional> <set> <string> <string_view> <thread> <unordered_map> <utility> <vector>
    <json/value.h>)

# ferrox_precompile(OWNER TYPES SOURCES FOLDER): all targets of FOLDER and below whose type matches TYPES and one of
# whose sources matches SOURCES use the headers that the target OWNER has compiled. Libraries and programs are compiled
# with different flags (position-independent code), so that they cannot share an owner.
function(ferrox_precompile owner types of_sources folder)
  get_property(targets DIRECTORY ${folder} PROPERTY BUILDSYSTEM_TARGETS)
  list(REMOVE_ITEM targets ${owner})
  foreach(target ${targets})
    get_target_property(type ${target} TYPE)
    get_target_property(sources ${target} SOURCES)
    if(type MATCHES ${types} AND sources MATCHES ${of_sources})
      target_precompile_headers(${target} REUSE_FROM ${owner})
    endif()
  endforeach()
  get_property(folders DIRECTORY ${folder} PROPERTY SUBDIRECTORIES)
  foreach(below ${folders})
    ferrox_precompile(${owner} ${types} ${of_sources} ${below})
  endforeach()
endfunction()

if(FERROX_PRECOMPILE)
  file(WRITE ${CMAKE_BINARY_DIR}/precompiled_library.cpp "")
  add_library(precompiled_for_libraries STATIC ${CMAKE_BINARY_DIR}/precompiled_library.cpp)
  target_link_libraries(precompiled_for_libraries PRIVATE PkgConfig::jsoncpp ferrox_options)
  target_precompile_headers(precompiled_for_libraries PRIVATE ${ferrox_common_headers})
  foreach(folder base wire fileindex services cli)
    ferrox_precompile(precompiled_for_libraries LIBRARY "[.]cpp" ${CMAKE_SOURCE_DIR}/${folder})
  endforeach()
  # The platform shows all of its symbols, and so the types of its headers too.
  target_precompile_headers(kova_shared PRIVATE ${ferrox_common_headers})
  target_precompile_headers(platform_host REUSE_FROM kova_shared)
  if(FERROX_BUILD_TESTS)
    find_package(GTest REQUIRED)
    file(WRITE ${CMAKE_BINARY_DIR}/precompiled_program.cpp "int main() {}\n")
    add_executable(precompiled_for_tests ${CMAKE_BINARY_DIR}/precompiled_program.cpp)
    target_link_libraries(precompiled_for_tests PRIVATE PkgConfig::jsoncpp GTest::gtest GTest::gmock ferrox_options)
    target_precompile_headers(precompiled_for_tests PRIVATE ${ferrox_common_headers} <gmock/gmock.h> <gtest/gtest.h>)
    ferrox_test_options(precompiled_for_tests)
    ferrox_precompile(precompiled_for_tests EXECUTABLE "_test[.]cpp" ${CMAKE_SOURCE_DIR}/tests)
  endif()
endif()
