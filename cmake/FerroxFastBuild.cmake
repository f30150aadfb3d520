# Two ways to a short build; our sources are short, and reading headers and instantiating templates is most of their
# time: the headers of others that nearly every source includes are compiled once, and sources of one library are
# compiled several at a time, as one. No source may rely on either: each includes what it needs, and the build that the
# lint reads, which is without this, checks it.

set(ferrox_common_headers <algorithm> <array> <atomic> <cerrno> <chrono> <condition_variable> <cstdint> <cstdio> <cstring>
    <functional> <map> <memory> <mutex> <optional> <set> <string> <string_view> <thread> <unordered_map> <utility> <vector>
    <json/value.h>)

# ferrox_group_sources(COUNT TYPES SOURCES FOLDER): sources are compiled in groups of COUNT, in all targets of FOLDER and
# below whose type matches TYPES and one of whose sources matches SOURCES. So many in one that the next build after a
# change of one source still takes few seconds.
function(ferrox_group_sources count types of_sources folder)
  get_property(targets DIRECTORY ${folder} PROPERTY BUILDSYSTEM_TARGETS)
  foreach(target ${targets})
    get_target_property(type ${target} TYPE)
    get_target_property(sources ${target} SOURCES)
    if(type MATCHES ${types} AND sources MATCHES ${of_sources})
      set_target_properties(${target} PROPERTIES UNITY_BUILD ON UNITY_BUILD_BATCH_SIZE ${count}
                                                 UNITY_BUILD_CODE_BEFORE_INCLUDE "#undef FERROX_SOURCE")
    endif()
  endforeach()
  get_property(folders DIRECTORY ${folder} PROPERTY SUBDIRECTORIES)
  foreach(below ${folders})
    ferrox_group_sources(${count} ${types} ${of_sources} ${below})
  endforeach()
endfunction()

# ferrox_precompile(OWNER TYPES SOURCES FOLDER): all targets of FOLDER and below whose type matches TYPES and one of
# whose sources matches SOURCES use the headers that the target OWNER has compiled.
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

if(FERROX_FAST_BUILD)
  file(WRITE ${CMAKE_BINARY_DIR}/precompiled_library.cpp "")
  add_library(precompiled_for_products STATIC ${CMAKE_BINARY_DIR}/precompiled_library.cpp)
  target_link_libraries(precompiled_for_products PRIVATE PkgConfig::jsoncpp ferrox_options)
  target_precompile_headers(precompiled_for_products PRIVATE ${ferrox_common_headers})
  foreach(folder base wire fileindex services cli)
    ferrox_group_sources(10 LIBRARY "[.]cpp" ${CMAKE_SOURCE_DIR}/${folder})
    ferrox_precompile(precompiled_for_products "LIBRARY|EXECUTABLE" "[.]cpp" ${CMAKE_SOURCE_DIR}/${folder})
  endforeach()
  ferrox_group_sources(10 LIBRARY "[.]cpp" ${CMAKE_SOURCE_DIR}/platform)
  if(FERROX_BUILD_TESTS)
    ferrox_group_sources(10 LIBRARY "[.]cpp" ${CMAKE_SOURCE_DIR}/tests/support)
    ferrox_group_sources(3 EXECUTABLE "_test[.]cpp" ${CMAKE_SOURCE_DIR}/tests)
    find_package(GTest REQUIRED)
    file(WRITE ${CMAKE_BINARY_DIR}/precompiled_program.cpp "int main() {}\n")
    add_executable(precompiled_for_tests ${CMAKE_BINARY_DIR}/precompiled_program.cpp)
    target_link_libraries(precompiled_for_tests PRIVATE PkgConfig::jsoncpp GTest::gtest GTest::gmock ferrox_options)
    target_precompile_headers(precompiled_for_tests PRIVATE ${ferrox_common_headers} <gmock/gmock.h> <gtest/gtest.h>)
    ferrox_test_options(precompiled_for_tests)
    ferrox_precompile(precompiled_for_tests EXECUTABLE "_test[.]cpp" ${CMAKE_SOURCE_DIR}/tests)
  endif()
endif()
