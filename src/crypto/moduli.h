// The built-in RSA moduli: 48 slots of (first, second) upper-case hex texts, deployment data.
#pragma once

namespace tessel {

constexpr int kBuiltinModulusSlots = 48;

// The modulus text of a slot (which = 0 first, 1 second), or null when absent / out of range.
const char* builtinModulus(int slot, int which) noexcept;

// The first modulus of slot 12: the application-platform key of the session output.
const char* builtinDefaultModulus() noexcept;

}  // namespace tessel
