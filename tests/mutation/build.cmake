# The mutation run's own settings, at the end of the project's: a source of src/ is compiled alone, without the
# optimizer, and a mistake that brings a warning is no error.
function(rcvlink_prepare_mutation)
  set_target_properties(rcvlink_core rcvlink PROPERTIES UNITY_BUILD OFF)
  target_compile_options(rcvlink_core PRIVATE -w)
  target_compile_options(rcvlink PRIVATE -w)
endfunction()
cmake_language(DEFER CALL rcvlink_prepare_mutation)
