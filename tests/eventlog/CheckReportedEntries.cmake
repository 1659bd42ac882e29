# cmake -DWINE_RUN=<wine-run> -DCHILD=<eventlog_child.exe> -P CheckReportedEntries.cmake
# Wine prints what ReportEventW receives on the process's own standard error (not the Windows
# handle a parent could redirect), so the child's messages are read here, on the Linux side.
cmake_minimum_required(VERSION 3.25)
set(ENV{WINEDEBUG} "-all,+eventlog")
execute_process(COMMAND ${WINE_RUN} ${CHILD} RESULT_VARIABLE failed OUTPUT_VARIABLE output ERROR_VARIABLE errors)
if(failed)
    message(FATAL_ERROR "the child failed (${failed}):\n${output}\n${errors}")
endif()
# Results of: error, warning, information, Log after UnInitializeEventLog, Log after
# InitializeEventLog, and the removal of the source the child registered.
if(NOT output MATCHES "results 1 1 1 0 1 removed 0")
    message(FATAL_ERROR "unexpected results: ${output}")
endif()
foreach(entry "err:eventlog:ReportEventW L\"error entry disk full #42\""
              "warn:eventlog:ReportEventW L\"warning entry low memory\""
              ":eventlog:ReportEventW L\"information entry 75% done\""
              "err:eventlog:ReportEventW L\"reopened entry after initialisation\"")
    string(FIND "${errors}" "${entry}" found)
    if(found EQUAL -1)
        message(FATAL_ERROR "entry not reported: ${entry}\nstandard error:\n${errors}")
    endif()
endforeach()
string(FIND "${errors}" "must not appear" found)
if(NOT found EQUAL -1)
    message(FATAL_ERROR "an entry was reported while the source was closed:\n${errors}")
endif()
