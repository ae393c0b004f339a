# Labels for cross builds run through CMAKE_CROSSCOMPILING_EMULATOR (tools/run_aarch64_tests.sh):
# noemu marks suites that cannot run there (the host JVM cannot load an aarch64 library; the
# window demo's script starts its binary directly); gpu marks the Mesa-rendering suites, which
# pass but take most of the run (`ctest -LE gpu` skips them). Appended once every suite exists.
if(NOT CMAKE_CROSSCOMPILING)
  return()
endif()

function(tessel_label_emulated_suites)
  foreach(name jvm_suite window_demo)
    if(TEST ${name})
      set_property(TEST ${name} APPEND PROPERTY LABELS noemu)
    endif()
  endforeach()
  foreach(name render_surface_test threads_test)
    if(TEST ${name})
      set_property(TEST ${name} APPEND PROPERTY LABELS gpu)
    endif()
  endforeach()
endfunction()

if(CMAKE_VERSION VERSION_LESS 3.19)
  tessel_label_emulated_suites()
else()
  cmake_language(DEFER CALL tessel_label_emulated_suites)
endif()
