# What is installed for readers: the manual pages, and what shows the library's objects in gdb.
install(DIRECTORY docs/man/ DESTINATION ${CMAKE_INSTALL_MANDIR})

# gdb loads a script by itself when it has the full name of the library below its auto-load folder. The
# prefix is known only when things are installed.
set(KEL_GDB_NAME ${CMAKE_SHARED_LIBRARY_PREFIX}kel${CMAKE_SHARED_LIBRARY_SUFFIX}.${PROJECT_VERSION}-gdb.py)
install(CODE "
  cmake_path(ABSOLUTE_PATH CMAKE_INSTALL_PREFIX NORMALIZE OUTPUT_VARIABLE prefix)
  set(library \"${CMAKE_INSTALL_LIBDIR}\")
  cmake_path(ABSOLUTE_PATH library BASE_DIRECTORY \"\${prefix}\" NORMALIZE)
  file(INSTALL DESTINATION \"\${prefix}/share/gdb/auto-load\${library}\"
      TYPE FILE RENAME ${KEL_GDB_NAME} FILES \"${PROJECT_SOURCE_DIR}/gdb/kel-gdb.py\")
")
