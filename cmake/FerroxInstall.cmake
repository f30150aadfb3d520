# What is installed beside the programs: the two libraries, their headers below include/libfileindex, what other projects
# find them by (the CMake package "fileindex" and pkg-config's "libfileindex"), and the man pages.
include(CMakePackageConfigHelpers)

set(package_folder ${CMAKE_INSTALL_LIBDIR}/cmake/fileindex)
set(header_folder ${CMAKE_INSTALL_INCLUDEDIR}/libfileindex)

install(TARGETS fileindex platform_host kova_interface EXPORT fileindexTargets
        LIBRARY DESTINATION ${CMAKE_INSTALL_LIBDIR})
install(EXPORT fileindexTargets NAMESPACE fileindex:: DESTINATION ${package_folder})

# Of the library's own headers, those that describe what libfileindex.so shows, and of base's, which it does not show,
# those that these include: they have no source. The others are its own business.
install(DIRECTORY ${CMAKE_SOURCE_DIR}/common ${CMAKE_SOURCE_DIR}/sdk DESTINATION ${header_folder}
        FILES_MATCHING PATTERN "*.h")
foreach(header base/path base/scope_exit base/text base/thread_annotations base/unique_fd
        fileindex/folder fileindex/folder_mgr fileindex/index_mgr fileindex/optree fileindex/queue_mgr fileindex/status_mgr fileindex/util
        fileindex/watch_list fileindex/folders/folder fileindex/folders/folder_mgr fileindex/operations/index_mgr
        fileindex/operations/operation_error
        fileindex/operations/watch_list fileindex/optree/optree fileindex/queue/event fileindex/queue/queue_mgr fileindex/elastic/comm
        fileindex/elastic/elastic_control fileindex/elastic/fields wire/fields)
  get_filename_component(folder ${header} DIRECTORY)
  install(FILES ${CMAKE_SOURCE_DIR}/${header}.h DESTINATION ${header_folder}/${folder})
endforeach()
install(DIRECTORY ${CMAKE_SOURCE_DIR}/platform/include/kova DESTINATION ${header_folder} FILES_MATCHING PATTERN "*.h")

configure_package_config_file(${CMAKE_CURRENT_LIST_DIR}/fileindexConfig.cmake.in
                              ${CMAKE_BINARY_DIR}/fileindexConfig.cmake INSTALL_DESTINATION ${package_folder})
write_basic_package_version_file(${CMAKE_BINARY_DIR}/fileindexConfigVersion.cmake COMPATIBILITY SameMinorVersion)
install(FILES ${CMAKE_BINARY_DIR}/fileindexConfig.cmake ${CMAKE_BINARY_DIR}/fileindexConfigVersion.cmake
        DESTINATION ${package_folder})

configure_file(${CMAKE_CURRENT_LIST_DIR}/libfileindex.pc.in ${CMAKE_BINARY_DIR}/libfileindex.pc @ONLY)
install(FILES ${CMAKE_BINARY_DIR}/libfileindex.pc DESTINATION ${CMAKE_INSTALL_LIBDIR}/pkgconfig)

install(DIRECTORY ${CMAKE_SOURCE_DIR}/docs/man/ DESTINATION ${CMAKE_INSTALL_MANDIR}/man1 FILES_MATCHING PATTERN "*.1")
install(DIRECTORY ${CMAKE_SOURCE_DIR}/docs/man/ DESTINATION ${CMAKE_INSTALL_MANDIR}/man8 FILES_MATCHING PATTERN "*.8")

# Where the shells look for completions by themselves.
install(FILES ${CMAKE_SOURCE_DIR}/packaging/completions/fileindexctl.bash RENAME fileindexctl
        DESTINATION ${CMAKE_INSTALL_DATADIR}/bash-completion/completions)
install(FILES ${CMAKE_SOURCE_DIR}/packaging/completions/_fileindexctl
        DESTINATION ${CMAKE_INSTALL_DATADIR}/zsh/site-functions)

# systemd looks for units, tmpfiles and sysusers below "lib", whatever the folder of the libraries is called. The units
# name the programs with the prefix that is given when they are installed.
set(units kovaelasticd.service kova-engine-user.service kova-access.service kovanotifyd.service kovacontentextractd.service
    fileindexd.service fileindex-prepare.service kovawebd.service kovawebd.socket)
install(CODE "
  set(bin_folder \${CMAKE_INSTALL_PREFIX}/${CMAKE_INSTALL_BINDIR})
  set(sbin_folder \${CMAKE_INSTALL_PREFIX}/${CMAKE_INSTALL_SBINDIR})
  set(sysusers_folder \${CMAKE_INSTALL_PREFIX}/lib/sysusers.d)
  foreach(unit ${units})
    configure_file(${CMAKE_SOURCE_DIR}/packaging/systemd/\${unit}.in ${CMAKE_BINARY_DIR}/\${unit} @ONLY)
  endforeach()")
foreach(unit ${units})
  install(FILES ${CMAKE_BINARY_DIR}/${unit} DESTINATION lib/systemd/system)
endforeach()
install(FILES ${CMAKE_SOURCE_DIR}/packaging/tmpfiles.d/libfileindex.conf DESTINATION lib/tmpfiles.d)
install(FILES ${CMAKE_SOURCE_DIR}/packaging/sysusers.d/libfileindex.conf DESTINATION lib/sysusers.d)
