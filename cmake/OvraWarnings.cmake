# Warnings are errors for our own code only; third-party headers come in as system headers.
function(ovra_set_warnings target)
  target_compile_options(${target} PRIVATE -Wall -Wextra -Werror -Wno-error=deprecated-declarations)
endfunction()
