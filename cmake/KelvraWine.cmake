# Runs the Windows programs of the build under Wine, in a prefix that belongs to this build tree.
find_program(KELVRA_WINE NAMES wine PATHS /usr/bin NO_DEFAULT_PATH REQUIRED)
find_program(KELVRA_WINESERVER NAMES wineserver PATHS /usr/bin /usr/lib/wine NO_DEFAULT_PATH REQUIRED)

set(KELVRA_WINEPREFIX ${PROJECT_BINARY_DIR}/wineprefix)
configure_file(${CMAKE_CURRENT_LIST_DIR}/wine-run.sh.in ${PROJECT_BINARY_DIR}/wine-run @ONLY
               FILE_PERMISSIONS OWNER_READ OWNER_WRITE OWNER_EXECUTE GROUP_READ GROUP_EXECUTE
                                WORLD_READ WORLD_EXECUTE)
set(KELVRA_WINE_RUN ${PROJECT_BINARY_DIR}/wine-run)
set(CMAKE_CROSSCOMPILING_EMULATOR ${KELVRA_WINE_RUN})
