# Suites that check libTesselVIP.so from the outside (included by tests/CMakeLists.txt):
#   jni_exports     the dynamic symbol table holds exactly the 51 native methods of QNKbdJniLib;
#   jvm_suite       a real JVM loads the library and drives keyboards through QNKbdJniLib only,
#                   with GL surfaces on offscreen GLES 1.1 contexts (libtessel_jvm_helpers.so), and
#                   opens the outputs with both server-side openers (tessel_open, tessel-server.jar);
# plus the build-time check that the native entry points match the header javac -h writes.
if(NOT TARGET TesselVIP OR NOT TARGET tessel_java)
  message(STATUS "libTesselVIP.so or the managed class is not built: JVM suites skipped")
  return()
endif()

find_package(Java COMPONENTS Runtime Development)
include(UseJava)
set(TESSEL_JVM_DIR "${CMAKE_CURRENT_LIST_DIR}/jvm")
get_target_property(TESSEL_JNI_HEADER_DIR tessel_jni_headers INTERFACE_INCLUDE_DIRECTORIES)

# Compile-only: every Java_* definition against the javac-generated declaration.
add_library(tessel_jni_signatures OBJECT "${TESSEL_JVM_DIR}/jni_signatures.cpp")
target_include_directories(tessel_jni_signatures PRIVATE
  "${PROJECT_SOURCE_DIR}/src" ${TESSEL_GENERATED_DIR} ${TESSEL_JNI_INCLUDE} ${TESSEL_JNI_MD_HINT})
target_link_libraries(tessel_jni_signatures PRIVATE tessel_jni_headers)
target_compile_options(tessel_jni_signatures PRIVATE ${TESSEL_WARNINGS})

add_test(NAME jni_exports
  COMMAND ${CMAKE_COMMAND} -DNM=${CMAKE_NM} -DLIBRARY=$<TARGET_FILE:TesselVIP>
          -DHEADER=${TESSEL_JNI_HEADER_DIR}/com_qn_tessel_plugin_QNKbdJniLib.h
          -P "${TESSEL_JVM_DIR}/check_exports.cmake")
set_tests_properties(jni_exports PROPERTIES TIMEOUT 60)

if(NOT TESSEL_EGL_LIBRARY OR NOT TARGET tessel_open OR NOT TARGET tessel_server_java OR NOT Java_JAVA_EXECUTABLE)
  message(STATUS "EGL, an opener or a Java runtime missing: jvm_suite skipped")
  return()
endif()

# Test-only JNI helpers: an offscreen GLES 1.1 context per renderer thread, and the core's
# dispatcher for the types the native methods never pass (its copy of the core is not exported).
add_library(tessel_jvm_helpers SHARED "${TESSEL_JVM_DIR}/native/egl_helper.cpp" "${TESSEL_JVM_DIR}/native/dispatch_helper.cpp")
target_include_directories(tessel_jvm_helpers PRIVATE ${TESSEL_JNI_INCLUDE} ${TESSEL_JNI_MD_HINT} ${PROJECT_SOURCE_DIR}/tools)
target_link_libraries(tessel_jvm_helpers PRIVATE tessel_core ${TESSEL_EGL_LIBRARY} ${TESSEL_GLES_LIBRARY})
target_link_options(tessel_jvm_helpers PRIVATE "-Wl,--exclude-libs,ALL")
target_compile_options(tessel_jvm_helpers PRIVATE ${TESSEL_WARNINGS})

file(GLOB TESSEL_JVM_SOURCES CONFIGURE_DEPENDS "${TESSEL_JVM_DIR}/com/qn/tessel/test/*.java")
set(CMAKE_JAVA_COMPILE_FLAGS -encoding UTF-8 -Xlint:all -Xlint:-options -Werror)
add_jar(tessel_jvm_tests SOURCES ${TESSEL_JVM_SOURCES} INCLUDE_JARS tessel_java tessel_server_java
        OUTPUT_NAME TesselJvmTests)
get_target_property(TESSEL_JVM_TESTS_JAR tessel_jvm_tests JAR_FILE)

file(MAKE_DIRECTORY "${CMAKE_CURRENT_BINARY_DIR}/output/jvm")
add_test(NAME jvm_suite
  COMMAND ${Java_JAVA_EXECUTABLE} -Xcheck:jni
          -Dtessel.library=$<TARGET_FILE:TesselVIP>
          -Dtessel.helpers=$<TARGET_FILE:tessel_jvm_helpers>
          -Dtessel.server=$<TARGET_FILE:tessel_open>
          -Dtessel.appKey=${CMAKE_CURRENT_LIST_DIR}/data/builtin_default_key.pem
          -Dtessel.tmp=${CMAKE_CURRENT_BINARY_DIR}/output/jvm
          -cp "${TESSEL_JVM_TESTS_JAR}:${TESSEL_JAVA_JAR}:${TESSEL_SERVER_JAR}"
          com.qn.tessel.test.JvmSuite)
set_tests_properties(jvm_suite PROPERTIES TIMEOUT 300
  FAIL_REGULAR_EXPRESSION "WARNING in native method|FATAL ERROR in native method")

# Under AddressSanitizer (GCC) the JVM gets the runtime preloaded, so the suite checks the JNI
# layer too; the JVM handles SIGSEGV itself and keeps its heap to exit (handle_segv=0, no leak
# report). Other sanitizers cannot run in an uninstrumented JVM: the suite is labelled nosan.
if(TESSEL_SANITIZE)
  if(TESSEL_SANITIZE MATCHES "address" AND NOT TESSEL_SANITIZE MATCHES "thread|memory" AND CMAKE_CXX_COMPILER_ID STREQUAL "GNU")
    execute_process(COMMAND ${CMAKE_CXX_COMPILER} -print-file-name=libasan.so
                    OUTPUT_VARIABLE TESSEL_JVM_PRELOAD OUTPUT_STRIP_TRAILING_WHITESPACE)
  endif()
  if(TESSEL_JVM_PRELOAD AND EXISTS "${TESSEL_JVM_PRELOAD}")
    set_property(TEST jvm_suite PROPERTY ENVIRONMENT
      "LD_PRELOAD=${TESSEL_JVM_PRELOAD}"
      "ASAN_OPTIONS=detect_leaks=0:handle_segv=0:allow_user_segv_handler=1:use_sigaltstack=0"
      "UBSAN_OPTIONS=print_stacktrace=1")
  else()
    set_property(TEST jvm_suite PROPERTY LABELS nosan)
  endif()
endif()
