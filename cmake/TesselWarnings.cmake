# Warning flags every target of the project gets through tessel_warnings().
add_library(tessel_warnings INTERFACE)
target_compile_options(tessel_warnings INTERFACE -Wall -Wextra)
option(TESSEL_WERROR "Treat warnings as errors" OFF)
if(TESSEL_WERROR)
    target_compile_options(tessel_warnings INTERFACE -Werror)
endif()

# Adds the project's warning flags to a target.
function(tessel_warnings target)
    target_link_libraries(${target} PRIVATE tessel_warnings)
endfunction()
