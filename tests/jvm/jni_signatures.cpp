// Compile-only check: the native entry points against the header that javac -h writes from
// QNKbdJniLib.java. An extern "C" definition whose parameters or result differ from the Java
// declaration is a "conflicting declaration" error here, a mismatch that neither the linker nor
// the JVM (which resolves natives by name only) would report. Never linked.
#include "com_qn_tessel_plugin_QNKbdJniLib.h"

#include "jni/native_session.cpp"   // NOLINT(bugprone-suspicious-include)
#include "jni/native_settings.cpp"  // NOLINT(bugprone-suspicious-include)
