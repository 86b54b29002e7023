# Installs the built library into a scratch prefix, then configures, builds and runs a
# separate host project that finds it with find_package(KestCalmorph).
file(REMOVE_RECURSE ${KEST_WORK_DIR})
set(prefix ${KEST_WORK_DIR}/prefix)
execute_process(COMMAND ${CMAKE_COMMAND} --install ${KEST_BINARY_DIR} --prefix ${prefix}
                RESULT_VARIABLE rc)
if(NOT rc EQUAL 0)
  message(FATAL_ERROR "install failed: ${rc}")
endif()
# A sanitized library needs its runtime linked into the host as well.
set(extra_flags "")
if(KEST_SANITIZE)
  set(extra_flags "-fsanitize=address,undefined")
endif()
execute_process(COMMAND ${CMAKE_COMMAND} -S ${KEST_SOURCE_DIR}/tests/consumer/project
                -B ${KEST_WORK_DIR}/build -G ${KEST_GENERATOR}
                -DCMAKE_BUILD_TYPE=${KEST_BUILD_TYPE} -DCMAKE_PREFIX_PATH=${prefix}
                "-DCMAKE_CXX_FLAGS=${extra_flags}"
                RESULT_VARIABLE rc)
if(NOT rc EQUAL 0)
  message(FATAL_ERROR "consumer configure failed: ${rc}")
endif()
execute_process(COMMAND ${CMAKE_COMMAND} --build ${KEST_WORK_DIR}/build RESULT_VARIABLE rc)
if(NOT rc EQUAL 0)
  message(FATAL_ERROR "consumer build failed: ${rc}")
endif()
execute_process(COMMAND ${KEST_WORK_DIR}/build/consumer RESULT_VARIABLE rc
                OUTPUT_VARIABLE out ERROR_VARIABLE out)
message(STATUS "${out}")
if(NOT rc EQUAL 0)
  message(FATAL_ERROR "consumer run failed: ${rc}")
endif()
