# Installs the library into a scratch prefix, then checks what a host receives: no header of a
# private detail/ unit, every installed header compiles on its own, and the shared library
# exports nothing that is defined in namespace kest::detail.
file(REMOVE_RECURSE ${KEST_WORK_DIR})
set(prefix ${KEST_WORK_DIR}/prefix)
execute_process(COMMAND ${CMAKE_COMMAND} --install ${KEST_BINARY_DIR} --prefix ${prefix}
                OUTPUT_QUIET RESULT_VARIABLE rc)
if(NOT rc EQUAL 0)
  message(FATAL_ERROR "install failed: ${rc}")
endif()

file(GLOB_RECURSE headers RELATIVE ${prefix}/include ${prefix}/include/*.h)
foreach(header ${headers})
  file(READ ${prefix}/include/${header} text)
  if(header MATCHES "/detail/" OR text MATCHES "#include \"[^\"]*detail/")
    message(SEND_ERROR "${header}: private detail installed or included")
  endif()
  set(source ${KEST_WORK_DIR}/alone.cpp)
  file(WRITE ${source} "#include <${header}>\n")
  execute_process(COMMAND ${KEST_CXX} -std=c++17 -fsyntax-only -Wall -Werror -I${prefix}/include
                          ${source}
                  RESULT_VARIABLE rc ERROR_VARIABLE errors)
  if(NOT rc EQUAL 0)
    message(SEND_ERROR "${header} does not compile alone:\n${errors}")
  endif()
endforeach()

file(GLOB libraries ${prefix}/lib*/libkestcalmorph.so)
execute_process(COMMAND nm -DC --defined-only ${libraries} OUTPUT_VARIABLE symbols
                RESULT_VARIABLE rc)
if(NOT rc EQUAL 0 OR NOT symbols MATCHES "KestCalmorph")
  message(FATAL_ERROR "cannot list the exported symbols of ${libraries}")
endif()
# A symbol of namespace detail has it in its own name, perhaps after words such as "typeinfo
# for" or a template's return type; opaque detail handles among the parameters are allowed.
string(REPLACE ";" "," symbols "${symbols}")
string(REPLACE "\n" ";" symbols "${symbols}")
set(leaks "")
foreach(line ${symbols})
  if(line MATCHES "^[0-9a-f]+ [A-Za-z] ([^ (]+ )*kest::detail::")
    string(APPEND leaks "\n  ${line}")
  endif()
endforeach()
if(leaks)
  message(FATAL_ERROR "kest::detail symbols exported:${leaks}")
endif()
list(LENGTH headers count)
message(STATUS "${count} installed headers compile alone; no kest::detail symbol exported")
