# Warnings for the project's own code (library, tests, examples, benchmarks); never for GoogleTest.
function(kelvra_warnings target)
    target_compile_options(${target} PRIVATE -Wall -Wextra)
    if(KELVRA_WARNINGS_AS_ERRORS)
        target_compile_options(${target} PRIVATE -Werror)
    endif()
endfunction()
