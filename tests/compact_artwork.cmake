# The compact artwork build's suite (tests/CMakeLists.txt includes only this file in that build):
# the uploads of its library against those of the raw pixels (compact_artwork.cpp), and the size
# of libTesselVIP.so, the point of the build.
if(NOT TESSEL_COMPACT_ARTWORK)
  return()
endif()
find_library(TESSEL_EGL_LIBRARY NAMES EGL REQUIRED)
add_executable(compact_artwork compact_artwork.cpp)
add_executable(compact_artwork_raw compact_artwork.cpp)
add_library(tessel_images_raw OBJECT "${TESSEL_IMAGE_DIR}/images.S")
target_compile_options(tessel_images_raw PRIVATE "-Wa,-I${TESSEL_IMAGE_DIR}")
target_compile_definitions(compact_artwork_raw PRIVATE TESSEL_RAW_PIXELS=1)
target_link_libraries(compact_artwork_raw PRIVATE tessel_images_raw)  # the library's own arrays stay out
foreach(target compact_artwork compact_artwork_raw)
  target_include_directories(${target} PRIVATE ${CMAKE_CURRENT_SOURCE_DIR})
  target_compile_options(${target} PRIVATE ${TESSEL_WARNINGS})
  target_link_libraries(${target} PRIVATE tessel_core ${TESSEL_EGL_LIBRARY})
endforeach()
add_test(NAME compact_artwork_uploads COMMAND sh -c [["$0" >compact.txt && "$1" >raw.txt && cmp raw.txt compact.txt]]
         $<TARGET_FILE:compact_artwork> $<TARGET_FILE:compact_artwork_raw>)
if(TARGET TesselVIP AND NOT TESSEL_SANITIZE)
  add_test(NAME compact_artwork_size COMMAND sh -c [[set -- $(size "$0" | tail -n 1); echo "text $1 + data $2 bytes"; test $(($1 + $2)) -le 600000]]
           $<TARGET_FILE:TesselVIP>)
endif()
