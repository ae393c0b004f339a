# The demo's window mode typed by hand under Xvfb with xdotool; skipped without GLFW or the X tools.
# Labelled nosan: Mesa, X11 and GLFW run uninstrumented.
if(NOT TARGET tessel_demo)
  message(STATUS "tessel_demo is not built: window_demo skipped")
  return()
endif()
get_property(TESSEL_DEMO_HAS_WINDOW GLOBAL PROPERTY TESSEL_DEMO_WINDOW)
add_test(NAME window_demo COMMAND bash "${CMAKE_CURRENT_LIST_DIR}/window_demo_test.sh"
  $<TARGET_FILE:tessel_demo> $<BOOL:${TESSEL_DEMO_HAS_WINDOW}>)
set_tests_properties(window_demo PROPERTIES TIMEOUT 90 LABELS nosan
  SKIP_REGULAR_EXPRESSION "window_demo_test: skipped")
