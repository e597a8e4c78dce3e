# What programs that write trace files need: headers, libraries and how to use
# them. The programs, the pages and the rest are installed where they are made,
# in the component "runtime".

install(DIRECTORY trace/include/ DESTINATION ${CMAKE_INSTALL_INCLUDEDIR}/kelvo COMPONENT dev
        FILES_MATCHING PATTERN "*.h")
install(FILES trace/writer/trace_clock.h trace/writer/trace_writer.h
        DESTINATION ${CMAKE_INSTALL_INCLUDEDIR}/kelvo COMPONENT dev)
install(TARGETS trace_writer kv_cu ARCHIVE DESTINATION ${CMAKE_INSTALL_LIBDIR} COMPONENT dev)

# The tree may be moved after it was installed, so the file finds its prefix
# from where it stands itself.
set(pc_dir ${CMAKE_INSTALL_LIBDIR}/pkgconfig)
file(RELATIVE_PATH prefix_from_pc /prefix/${pc_dir} /prefix)
string(REGEX REPLACE "/$" "" prefix_from_pc ${prefix_from_pc})
configure_file(cmake/kelvo-trace.pc.in ${PROJECT_BINARY_DIR}/kelvo-trace.pc @ONLY)
install(FILES ${PROJECT_BINARY_DIR}/kelvo-trace.pc DESTINATION ${pc_dir} COMPONENT dev)
