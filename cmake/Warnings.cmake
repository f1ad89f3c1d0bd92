option(TFX_WARNINGS_AS_ERRORS "Treat compiler warnings as errors" ON)

# Flags every target of the project gets: strict warnings, no fused multiply-add contraction
# (exact kernels must give the same bits on every instruction set), hidden symbols by default.
function(tfx_set_flags target)
  target_compile_options(${target} PRIVATE
    -Wall -Wextra -Wpedantic -Wshadow -Wnon-virtual-dtor -Wimplicit-fallthrough
    -ffp-contract=off)
  if(TFX_WARNINGS_AS_ERRORS)
    target_compile_options(${target} PRIVATE -Werror)
  endif()
  set_target_properties(${target} PROPERTIES
    CXX_VISIBILITY_PRESET hidden
    VISIBILITY_INLINES_HIDDEN ON
    POSITION_INDEPENDENT_CODE ON)
endfunction()
