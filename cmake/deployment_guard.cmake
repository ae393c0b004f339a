# Refuses to configure an Android build that would ship the demo deployment data committed in
# src/crypto: the private key of the demo default modulus is published (tests/data) and the demo
# master PIN keys are in the source, so such an app seals every envelope for anyone. Host builds
# (tests, the demo, CI) only warn. A copy of a demo file under another name counts as demo data:
# the check compares contents, not paths.
option(TESSEL_ALLOW_DEMO_KEYS "Allow the committed demo moduli table and master PIN keys in an Android build" OFF)

set(_tessel_demo_options "")
foreach(_tessel_pair "TESSEL_MODULI_FILE;builtin_moduli.inc" "TESSEL_MASTER_KEYS_FILE;master_keys.inc")
  list(GET _tessel_pair 0 _tessel_var)
  list(GET _tessel_pair 1 _tessel_name)
  set(_tessel_file "${${_tessel_var}}")
  if(NOT EXISTS "${_tessel_file}" OR IS_DIRECTORY "${_tessel_file}")
    message(FATAL_ERROR "${_tessel_var}: no such file: '${_tessel_file}'")
  endif()
  file(SHA256 "${_tessel_file}" _tessel_hash)
  file(SHA256 "${CMAKE_CURRENT_LIST_DIR}/../src/crypto/${_tessel_name}" _tessel_demo_hash)
  file(STRINGS "${_tessel_file}" _tessel_marker REGEX "^#define TESSEL_MASTER_KEYS_DEMO")
  if(_tessel_hash STREQUAL _tessel_demo_hash OR _tessel_marker)
    list(APPEND _tessel_demo_options "${_tessel_var}")
  endif()
endforeach()

if(_tessel_demo_options)
  string(REPLACE ";" " and " _tessel_which "${_tessel_demo_options}")
  set(_tessel_demo_text
    "${_tessel_which} point at the demo deployment data committed with the source "
    "(src/crypto/builtin_moduli.inc, whose default modulus has its private key in "
    "tests/data/builtin_default_key.pem, and src/crypto/master_keys.inc). Anyone can open what "
    "such a library seals. Make production data outside the source tree with\n"
    "    tools/keys/make_deployment.sh -c <config dir> -s <secrets dir>\n"
    "and configure with -C <config dir>/deployment.cmake, which sets "
    "-DTESSEL_MODULI_FILE=<config dir>/moduli.inc and "
    "-DTESSEL_MASTER_KEYS_FILE=<config dir>/master_keys.inc (docs/deployment.md).")
  if(ANDROID OR CMAKE_SYSTEM_NAME STREQUAL "Android")
    if(TESSEL_ALLOW_DEMO_KEYS)
      message(WARNING "Tessel: demo keys allowed in an Android build (TESSEL_ALLOW_DEMO_KEYS=ON). "
                      "Never ship this library. " ${_tessel_demo_text})
    else()
      message(FATAL_ERROR "Tessel: refusing an Android build with demo keys. " ${_tessel_demo_text}
                          "\nFor a demo or test app only, pass -DTESSEL_ALLOW_DEMO_KEYS=ON.")
    endif()
  elseif(TESSEL_ALLOW_DEMO_KEYS)
    message(STATUS "Tessel: demo deployment data in use (${_tessel_which}; TESSEL_ALLOW_DEMO_KEYS=ON)")
  else()
    message(WARNING "Tessel: host build with demo keys, fine for tests and the demo, never for an app. "
                    ${_tessel_demo_text})
  endif()
endif()
