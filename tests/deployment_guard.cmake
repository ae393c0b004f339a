# The configure-time guard against demo deployment data. Included by tests/CMakeLists.txt it
# registers itself; run with -P it configures the project in scratch directories with the
# variables the NDK toolchain file sets (ANDROID, ANDROID_ABI, ANDROID_PLATFORM; the compiler
# stays the host's) and checks the exit status and the messages of each case.
if(NOT CMAKE_SCRIPT_MODE_FILE)
  add_test(NAME deployment_guard COMMAND ${CMAKE_COMMAND} -DSOURCE=${PROJECT_SOURCE_DIR}
           -DWORK=${CMAKE_CURRENT_BINARY_DIR}/deployment_guard "-DGENERATOR=${CMAKE_GENERATOR}"
           -P ${CMAKE_CURRENT_LIST_FILE})
  set_tests_properties(deployment_guard PROPERTIES TIMEOUT 300)
  return()
endif()

cmake_minimum_required(VERSION 3.18)
file(REMOVE_RECURSE "${WORK}")
# Production-like data: the demo table with its header changed, and master keys without the
# demo marker; a renamed copy of the demo keys must still count as demo data.
file(READ "${SOURCE}/src/crypto/builtin_moduli.inc" moduli)
file(WRITE "${WORK}/own/moduli.inc" "// production table\n${moduli}")
file(READ "${SOURCE}/src/crypto/master_keys.inc" keys)
file(WRITE "${WORK}/own/copied_master_keys.inc" "${keys}")
string(REGEX REPLACE "#define TESSEL_MASTER_KEYS_DEMO 1\n" "" keys "${keys}")
string(REPLACE "0123456789AB" "A1B2C3D4E5F6" keys "${keys}")
file(WRITE "${WORK}/own/master_keys.inc" "${keys}")
set(own_moduli "-DTESSEL_MODULI_FILE=${WORK}/own/moduli.inc")
set(own_keys "-DTESSEL_MASTER_KEYS_FILE=${WORK}/own/master_keys.inc")
set(android "-DANDROID=TRUE^-DANDROID_ABI=arm64-v8a^-DANDROID_PLATFORM=android-21")

# name | exit status expected (0 or 1) | regexes the output must (!: must not) match, comma-separated | arguments, ^-separated
set(cases
  "android_demo|1|refusing an Android build,TESSEL_MODULI_FILE and TESSEL_MASTER_KEYS_FILE point,tools/keys/make_deployment.sh,-DTESSEL_ALLOW_DEMO_KEYS=ON|${android}"
  "android_copied_keys|1|refusing an Android build,TESSEL_MASTER_KEYS_FILE point,!TESSEL_MODULI_FILE and|${android}^${own_moduli}^-DTESSEL_MASTER_KEYS_FILE=${WORK}/own/copied_master_keys.inc"
  "android_opt_in|0|CMake Warning,demo keys allowed in an Android build,Generating done|${android}^-DTESSEL_ALLOW_DEMO_KEYS=ON"
  "android_own_data|0|Generating done,!Tessel:|${android}^${own_moduli}^${own_keys}"
  "host_demo|0|CMake Warning,host build with demo keys,tools/keys/make_deployment.sh,Generating done|")
set(failed 0)
foreach(case IN LISTS cases)
  string(REPLACE "|" ";" fields "${case}")
  list(GET fields 0 name)
  list(GET fields 1 expected)
  list(GET fields 2 patterns)
  string(REGEX REPLACE "^[^|]*\\|[^|]*\\|[^|]*\\|" "" args "${case}")
  string(REPLACE "^" ";" args "${args}")
  string(REPLACE "," ";" patterns "${patterns}")
  execute_process(COMMAND ${CMAKE_COMMAND} -S ${SOURCE} -B ${WORK}/${name} -G ${GENERATOR}
                          -DTESSEL_BUILD_TESTS=OFF -DTESSEL_BUILD_TOOLS=OFF ${args}
                  RESULT_VARIABLE rc OUTPUT_VARIABLE out ERROR_VARIABLE out)
  string(REGEX REPLACE "[ \n]+" " " flat "${out}")  # CMake wraps long messages
  set(ok TRUE)
  if((rc EQUAL 0) EQUAL (expected EQUAL 0))
  else()
    set(ok FALSE)
  endif()
  foreach(pattern IN LISTS patterns)
    if(pattern MATCHES "^!(.*)")
      if(flat MATCHES "${CMAKE_MATCH_1}")
        set(ok FALSE)
      endif()
    elseif(NOT flat MATCHES "${pattern}")
      set(ok FALSE)
    endif()
  endforeach()
  if(NOT ok)
    set(failed 1)
    message("FAILED ${name} (exit ${rc}):\n${out}")
  else()
    message("ok ${name} (exit ${rc})")
  endif()
endforeach()
if(failed)
  message(FATAL_ERROR "the deployment guard misbehaved")
endif()
