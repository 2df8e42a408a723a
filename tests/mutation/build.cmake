# The mutation run's own settings, at the end of the project's. A source of src/ is compiled alone and fast: without
# the optimizer, and the headers that all use only once. A mistake that brings a warning is no error.
function(rcvlink_prepare_mutation)
  set_target_properties(rcvlink_core PROPERTIES UNITY_BUILD OFF)
  target_compile_options(rcvlink_core PRIVATE -w -O0 -fpch-preprocess)
  target_precompile_headers(rcvlink_core PRIVATE ${CMAKE_SOURCE_DIR}/src/platform/win32.h
    <objidl.h> <oleauto.h>
    <algorithm> <array> <atomic> <functional> <memory> <mutex> <optional> <span> <string> <string_view> <utility> <vector>)
  target_compile_options(rcvlink PRIVATE -w)
endfunction()
if(PROJECT_IS_TOP_LEVEL)  # it is read for GoogleTest as well
  cmake_language(DEFER CALL rcvlink_prepare_mutation)
endif()
