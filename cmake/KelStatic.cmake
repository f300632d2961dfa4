# libkel.a and its target kel::kel_static, made of the objects of the shared library.
#
# The archive has one member, in which all units are linked together in the order of the list. From an
# archive of many members a program would take those it happens to name, in the order in which it names
# them: descriptions of exceptions would be missing, and the initialisers would run in another order.
if(KEL_WORD_SIZE EQUAL 32)
  set(emulation elf_i386)
else()
  set(emulation elf_x86_64)
endif()
set(member ${CMAKE_CURRENT_BINARY_DIR}/kel.o)
add_custom_command(OUTPUT ${member}
    COMMAND ${CMAKE_LINKER} -m ${emulation} -r -o ${member} $<TARGET_OBJECTS:kel>
    DEPENDS $<TARGET_OBJECTS:kel> COMMAND_EXPAND_LISTS VERBATIM
    COMMENT "Linking the units of libkel.a into one")

add_library(kel_static STATIC ${member})
add_library(kel::kel_static ALIAS kel_static)
add_dependencies(kel_static kel)  # makes the objects; make does not see that by their names
set_target_properties(kel_static PROPERTIES OUTPUT_NAME kel LINKER_LANGUAGE CXX)
kel_library_interface(kel_static)
target_link_libraries(kel_static INTERFACE pthread ${CMAKE_DL_LIBS})  # older C libraries keep them apart
# A plug-in that contains the library stays loaded, as libkel.so does: the destructor of its
# thread-specific key must be there when the next thread ends.
target_link_options(kel_static INTERFACE -Wl,-z,nodelete)
if(NOT KEL_INSTALL)
  set_target_properties(kel_static PROPERTIES EXCLUDE_FROM_ALL ON)
endif()
