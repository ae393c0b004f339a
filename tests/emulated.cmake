# Labels for cross builds whose suites run through CMAKE_CROSSCOMPILING_EMULATOR (the aarch64
# run of tools/run_aarch64_tests.sh, under user-mode QEMU):
#   noemu  suites that cannot run there: jvm_suite (the host's x86-64 JVM cannot load an aarch64
#          libTesselVIP.so) and window_demo (its script starts the demo binary directly, with no
#          emulator in between);
#   gpu    suites that render on Mesa's GLES 1.1 (llvmpipe, itself emulated): they pass, but take
#          most of the run's time; `ctest -LE gpu` gives a quick pass without them.
# The labels are appended at the end of this directory, once every suite, including those of
# the other scripts here, has been added.
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
