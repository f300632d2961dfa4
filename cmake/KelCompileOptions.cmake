# Compiler and linker options: warnings for everything of ours, hardening for the library.
include(CheckCXXCompilerFlag)
find_package(Threads REQUIRED)

check_cxx_compiler_flag(-ftrivial-auto-var-init=zero KEL_HAS_AUTO_INIT_ZERO)
check_cxx_compiler_flag(-Wthread-safety KEL_HAS_THREAD_SAFETY)

set(KEL_SANITIZE_FLAGS "")
if(KEL_SANITIZE)
  set(KEL_SANITIZE_FLAGS -fsanitize=${KEL_SANITIZE} -fno-omit-frame-pointer)
  if(KEL_SANITIZE MATCHES "undefined")
    list(APPEND KEL_SANITIZE_FLAGS -fsanitize=float-cast-overflow -fno-sanitize-recover=all)
    # The check of function types shares their descriptions among libraries, so that none is unloaded.
    if(CMAKE_CXX_COMPILER_ID STREQUAL "Clang")
      list(APPEND KEL_SANITIZE_FLAGS -fno-sanitize=function)
    endif()
  endif()
endif()

# Options of every target of ours: library, tests, examples.
function(kel_common_options target)
  set_target_properties(${target} PROPERTIES CXX_STANDARD 17 CXX_STANDARD_REQUIRED ON CXX_EXTENSIONS OFF)
  target_compile_options(${target} PRIVATE -Wall -Wextra -Wpedantic -Wshadow ${KEL_SANITIZE_FLAGS})
  target_link_options(${target} PRIVATE ${KEL_SANITIZE_FLAGS})
  # Threads share the counters, and sums of counts that got lost make no sense to the reader.
  if(KEL_COVERAGE)
    target_compile_options(${target} PRIVATE --coverage -fprofile-update=atomic)
    target_link_options(${target} PRIVATE --coverage)
  endif()
  if(KEL_HAS_THREAD_SAFETY)
    target_compile_options(${target} PRIVATE -Wthread-safety)
  endif()
  if(KEL_WERROR)
    target_compile_options(${target} PRIVATE -Werror)
  endif()
  target_link_libraries(${target} PRIVATE Threads::Threads)
endfunction()

# Options of the library alone. Fortification is left to builds without sanitizers, which check
# the same calls themselves. LTO stays off: it reverses the order of the initialisers. So do units that
# are merged, which a project around this one may ask for as well.
function(kel_library_options target)
  kel_common_options(${target})
  target_include_directories(${target} PRIVATE ${PROJECT_SOURCE_DIR} ${PROJECT_BINARY_DIR}/include)
  set_target_properties(${target} PROPERTIES
      CXX_VISIBILITY_PRESET hidden VISIBILITY_INLINES_HIDDEN ON POSITION_INDEPENDENT_CODE ON
      INTERPROCEDURAL_OPTIMIZATION OFF UNITY_BUILD OFF)
  target_compile_definitions(${target} PRIVATE _FILE_OFFSET_BITS=64)
  target_compile_options(${target} PRIVATE -fno-lto -fno-strict-overflow -fno-delete-null-pointer-checks
      -Wformat -Werror=format-security)
  if(NOT KEL_SANITIZE)
    target_compile_definitions(${target} PRIVATE _GLIBCXX_ASSERTIONS)
    target_compile_options(${target} PRIVATE -fstack-protector-strong -fstack-clash-protection)
    # At 32 bits neither kernel nor C library watches where control goes: the marks that this asks for would
    # only take time, two hundredths of that of short calls.
    if(KEL_WORD_SIZE EQUAL 64)
      target_compile_options(${target} PRIVATE -fcf-protection)
    endif()
    if(CMAKE_BUILD_TYPE STREQUAL "RelWithDebInfo" OR CMAKE_BUILD_TYPE STREQUAL "Release")
      target_compile_definitions(${target} PRIVATE _FORTIFY_SOURCE=3)
    endif()
    if(KEL_HAS_AUTO_INIT_ZERO)
      target_compile_options(${target} PRIVATE -ftrivial-auto-var-init=zero)
    endif()
    # A project around this one may build with sanitizers of its own, whose symbols a program provides.
    if(NOT "${CMAKE_CXX_FLAGS} ${CMAKE_SHARED_LINKER_FLAGS}" MATCHES "-fsanitize=")
      target_link_options(${target} PRIVATE -Wl,-z,defs)
    endif()
  endif()
  # Its own functions the library calls directly, and others without a jump in between. That spares half
  # of the names that are looked up when it is loaded, and a quarter of the time of that. Data and the
  # functions that are listed have one address in the whole process all the same.
  set(compared ${PROJECT_SOURCE_DIR}/cmake/KelComparedAddresses.list)
  target_compile_options(${target} PRIVATE -fno-plt)
  if(CMAKE_CXX_COMPILER_ID STREQUAL "GNU")  # clang++ would take addresses within the library as well
    target_compile_options(${target} PRIVATE -fno-semantic-interposition)
    # Arguments are stored where the stack already reaches, instead of moving it before and after each call.
    # What calls often takes a fortieth less time, and the tables for unwinding are smaller by a fifth.
    # Locals of more than 32 bytes would be cleared by a string instruction, which is slow to start. A loop of
    # eight bytes at a time clears them up to 64 bytes, a call what is larger: a connect takes a
    # three-hundredth less time.
    if(KEL_WORD_SIZE EQUAL 32)
      target_compile_options(${target} PRIVATE -maccumulate-outgoing-args
        -mmemset-strategy=unrolled_loop:64:noalign,libcall:-1:noalign)
    endif()
  endif()
  target_link_options(${target} PRIVATE -Wl,--dynamic-list-data -Wl,--dynamic-list=${compared})
  set_property(TARGET ${target} APPEND PROPERTY LINK_DEPENDS ${compared})
  foreach(flag relro now noexecstack nodelete separate-code)
    target_link_options(${target} PRIVATE -Wl,-z,${flag})
  endforeach()
endfunction()

# What a program that uses the library has to know, in this tree and where it is installed.
function(kel_library_interface target)
  target_compile_features(${target} INTERFACE cxx_std_11)
  target_include_directories(${target} INTERFACE
      $<BUILD_INTERFACE:${PROJECT_SOURCE_DIR}>
      $<BUILD_INTERFACE:${PROJECT_BINARY_DIR}/include>
      $<INSTALL_INTERFACE:${CMAKE_INSTALL_INCLUDEDIR}>)
endfunction()
