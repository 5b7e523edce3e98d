# Compiles every header under include/quorin/ on its own, with nothing but
# include/ on the path, so that a public header that leans on an internal one,
# or on an include it forgot, fails here rather than at a host. Headers that
# declare the C interface are compiled as C too.
#
#   cmake -DCXX=<c++ compiler> -DCC=<c compiler> -DINCLUDE_DIR=<repo>/include
#         -DWORK_DIR=<scratch dir> [-DDEPENDENCY_INCLUDES=<dir;...>]
#         -P check_public_headers.cmake
# DEPENDENCY_INCLUDES are the headers of the libraries that the installed
# package itself requires (Eigen), and nothing else.

cmake_minimum_required(VERSION 3.16)

set(c_headers quorinapi.h export.h)
set(warnings -Wall -Wextra -pedantic -Werror)
set(dependency_flags "")
foreach(dir ${DEPENDENCY_INCLUDES})
  list(APPEND dependency_flags -isystem ${dir})
endforeach()

file(GLOB headers RELATIVE ${INCLUDE_DIR}/quorin ${INCLUDE_DIR}/quorin/*.h)
if(NOT headers)
  message(FATAL_ERROR "no headers found in ${INCLUDE_DIR}/quorin")
endif()
file(REMOVE_RECURSE ${WORK_DIR})
file(MAKE_DIRECTORY ${WORK_DIR})

set(failed "")
foreach(header ${headers})
  string(MAKE_C_IDENTIFIER ${header} stem)
  # Twice, so that a missing include guard shows as a redefinition.
  file(WRITE ${WORK_DIR}/${stem}.cpp "#include <quorin/${header}>\n#include <quorin/${header}>\n")
  execute_process(
    COMMAND ${CXX} -std=c++17 ${warnings} -fsyntax-only -I${INCLUDE_DIR} ${dependency_flags} ${WORK_DIR}/${stem}.cpp
    RESULT_VARIABLE rc OUTPUT_VARIABLE out ERROR_VARIABLE out)
  if(NOT rc EQUAL 0)
    list(APPEND failed "quorin/${header} (C++17)")
    message("quorin/${header} does not compile on its own as C++17:\n${out}")
  endif()
  if(header IN_LIST c_headers)
    # The typedef keeps a header of macros alone from being an empty unit.
    file(WRITE ${WORK_DIR}/${stem}.c
      "#include <quorin/${header}>\n#include <quorin/${header}>\ntypedef int quorin_header_check;\n")
    execute_process(
      COMMAND ${CC} -std=c99 ${warnings} -fsyntax-only -I${INCLUDE_DIR} ${WORK_DIR}/${stem}.c
      RESULT_VARIABLE rc OUTPUT_VARIABLE out ERROR_VARIABLE out)
    if(NOT rc EQUAL 0)
      list(APPEND failed "quorin/${header} (C99)")
      message("quorin/${header} does not compile on its own as C99:\n${out}")
    endif()
  endif()
endforeach()

list(LENGTH headers count)
if(failed)
  string(REPLACE ";" ", " failed "${failed}")
  message(FATAL_ERROR "public headers that don't stand alone: ${failed}")
endif()
message(STATUS "${count} public headers compile on their own")
