# The secret-hygiene suite replaces malloc/free to scan freed blocks, which a sanitizer's own
# allocator forbids: it runs in the plain builds only (and skips itself if built sanitized).
# Its symbols are exported so that a reported free() backtrace names the functions.
if(TARGET hygiene_test)
  set_target_properties(hygiene_test PROPERTIES ENABLE_EXPORTS ON)
  set_tests_properties(hygiene_test PROPERTIES LABELS nosan)
endif()
