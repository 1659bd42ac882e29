cmake_minimum_required(VERSION 3.25)
# Installs the build into a folder, builds tests/package against it as any host project would,
# and runs the host program under Wine. Driven by ctest (see CMakeLists.txt beside this file).
file(REMOVE_RECURSE ${WORK_DIR})
set(prefix ${WORK_DIR}/install)

function(run)
    execute_process(COMMAND ${ARGN} RESULT_VARIABLE failed OUTPUT_VARIABLE out ERROR_VARIABLE err)
    if(failed)
        message(FATAL_ERROR "failed: ${ARGN}\n${out}\n${err}")
    endif()
    set(output "${out}" PARENT_SCOPE)
endfunction()

run(${CMAKE_COMMAND} --install ${BUILD_DIR} --prefix ${prefix})
foreach(file include/Kelvra.h bin/KelvraSDK.dll lib/libKelvraSDK.dll.a
             lib/cmake/KelvraSDK/KelvraSDKConfig.cmake)
    if(NOT EXISTS ${prefix}/${file})
        message(FATAL_ERROR "the installed package lacks ${file}")
    endif()
endforeach()

run(${CMAKE_COMMAND} -S ${HOST_SOURCE_DIR} -B ${WORK_DIR}/build -G ${GENERATOR}
    -DCMAKE_TOOLCHAIN_FILE=${TOOLCHAIN_FILE} -DCMAKE_PREFIX_PATH=${prefix} -DCMAKE_BUILD_TYPE=Release)
run(${CMAKE_COMMAND} --build ${WORK_DIR}/build)
run(${WINE_RUN} ${WORK_DIR}/build/host.exe)
if(NOT output MATCHES "Zm9vYmFy foobar 0007 host\\.4120\\.net\\.log")
    message(FATAL_ERROR "unexpected output from the host program: ${output}")
endif()
