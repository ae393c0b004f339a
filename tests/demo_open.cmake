# The demo's closing tessel_open commands, run as printed (tests/demo_open_test.sh). nosan: the
# demo renders on Mesa, uninstrumented; noemu: the script starts the demo with no emulator.
if(NOT TARGET tessel_demo OR NOT TARGET tessel_open)
  return()
endif()
add_test(NAME demo_open COMMAND bash "${CMAKE_CURRENT_LIST_DIR}/demo_open_test.sh"
         $<TARGET_FILE:tessel_demo> "${CMAKE_SOURCE_DIR}")
set_tests_properties(demo_open PROPERTIES TIMEOUT 120 LABELS "nosan;noemu")
