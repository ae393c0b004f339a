#!/usr/bin/env python3
"""Writes the seed corpora of the fuzz targets into fuzz/corpus/<target>/.

Each seed is a small, meaningful input in the byte layout its fuzzer decodes (see the opening
comment of each fuzz/*_fuzzer.cpp). The RSA public keys of the DER seeds come from fresh
`openssl genrsa` key pairs (only the public halves are kept), so re-running changes those files.

Usage: fuzz/make_seeds.py [output dir]   (default: fuzz/corpus next to this script)
"""
import os
import subprocess
import sys
import tempfile

HERE = os.path.dirname(os.path.abspath(__file__))
OUT = sys.argv[1] if len(sys.argv) > 1 else os.path.join(HERE, "corpus")
SEP = "::::::::::"


def write(target, name, data):
    d = os.path.join(OUT, target)
    os.makedirs(d, exist_ok=True)
    if isinstance(data, str):
        data = data.encode("latin-1")
    with open(os.path.join(d, name), "wb") as f:
        f.write(data)


def rsa_public_der(bits, exponent=None):
    """PKCS#1 RSAPublicKey DER of a fresh key made by the openssl CLI."""
    with tempfile.TemporaryDirectory() as work:
        key = os.path.join(work, "key.pem")
        cmd = ["openssl", "genrsa", "-out", key]
        if exponent == 3:
            cmd.append("-3")
        cmd.append(str(bits))
        subprocess.run(cmd, check=True, capture_output=True)
        der = subprocess.run(["openssl", "rsa", "-in", key, "-RSAPublicKey_out", "-outform", "DER"],
                             check=True, capture_output=True).stdout
    return der


class Provider:
    """Builds inputs for LLVM's FuzzedDataProvider: strings and bytes are read from the front,
    integers from the back (most significant byte first)."""

    def __init__(self):
        self.front = bytearray()
        self.back = bytearray()

    def integer(self, lo, hi, value):
        span, v, n = hi - lo, value - lo, 0
        while n < 8 and (span >> (8 * n)) > 0:
            n += 1
        for k in reversed(range(n)):
            self.back.append((v >> (8 * k)) & 0xFF)

    def boolean(self, value):
        self.integer(0, 255, 1 if value else 0)

    def string(self, s):
        data = s.encode("latin-1") if isinstance(s, str) else bytes(s)
        self.front += data.replace(b"\\", b"\\\\") + b"\\;"

    def rest(self, s):
        self.front += s.encode("latin-1") if isinstance(s, str) else bytes(s)

    def bytes(self):
        return bytes(self.front) + bytes(reversed(self.back))


# ---- der_fuzzer: form byte, then the key
def der_seeds():
    keys = {"rsa512": rsa_public_der(512), "rsa1024": rsa_public_der(1024),
            "rsa2048": rsa_public_der(2048), "rsa1024_e3": rsa_public_der(1024, exponent=3)}
    for name, der in keys.items():
        write("der", name + "_hex", b"0" + der.hex().upper().encode())
        write("der", name + "_bin", b"\x01" + der)
        # The blob path: a 20-byte header, then the DER bytes reversed.
        header = bytes.fromhex("0602000000A40000" "5253413100040000" "01000100")
        write("der", name + "_blob", b"0" + (header + der[::-1]).hex().encode())
        write("der", name + "_blob_spaced", b"\x03" + header + der[::-1])
    der = keys["rsa1024"]
    # A real CryptoAPI public-key blob (modulus little-endian, no DER inside): refused.
    n = der[6:6 + 129].lstrip(b"\x00")
    blob = bytes.fromhex("0602000000A40000" "5253413100040000" "01000100") + n[::-1]
    write("der", "cryptoapi_blob", b"\x01" + blob)
    # Leading zero bytes, the short length form, lower-case hex, odd length.
    write("der", "short_form", b"\x01" + bytes.fromhex("300A0203000102" "0203010001"))
    write("der", "lower_odd", b"0" + der.hex()[1:].encode())
    write("der", "empty", b"0")


# ---- codec_fuzzer: raw bytes
def codec_seeds():
    for name, text in [("hex_abc", "ABC"), ("hex_g1", "G1"), ("hex_spaced", "0a bc\n\tDE\f\r\v"),
                       ("b64_ff", "/w=="), ("b64_ffff", "//8="), ("b64_man", "TWFu"),
                       ("b64_bad_pad", "/x=="), ("b64_inner_pad", "TW=u"), ("empty", "")]:
        write("codec", name, text)
    write("codec", "binary", bytes(range(256)))


# ---- pattern_fuzzer: flags, rule set, pattern length, pattern, text
def pattern_seeds():
    cases = [
        ("[:digit:]+", "0123", 48), ("[:print:]*[:digit:]+[:print:]*", "ab1!cd", 34),
        ("([0-9]{0,})|(.{0,5})", "ab!x", 200), ("([a-z]{6,})|([A-Z]{6,})", "abcdefghij", 6),
        ("[[:digit:][:punct:]]+", "12!34", 4), ("[[:alpha:][:punct:]]+", "a!b", 60),
        ("[:^digit:]+", "abc", 0), ("[a-z]{1,}", "kqhzmw", 1), ("[A-Z]{1,}", "ABC", 5),
        ("(a*)*b", "a" * 200, 47), ("(a|aa)*c", "a" * 64, 48), ("(\\w+)\\s(\\1)", "abc abc", 90),
        ("\\Qa.b\\E(?#note)x{2,3}?", "a.bxx", 91), ("^\\d{3}-\\d{4}$", "555-1234", 36),
        ("(?#c)[\\x41-\\x5a\\u0061]+", "AZa", 12), ("a++b|a*?c", "aaac", 255),
    ]
    for k, (pattern, text, rules) in enumerate(cases):
        write("pattern", "case%02d" % k, bytes([0, rules, len(pattern)]) + pattern.encode() + text.encode())
    ext = " [a-z] + # letters\n [0-9]* "
    write("pattern", "extended", bytes([1, 48, len(ext)]) + ext.encode() + b"abc123")
    write("pattern", "right_to_left", bytes([2, 48, 8]) + b"(a+)(b+)" + b"aaabb")


# ---- dispatch_fuzzer: type, keys, timestamp selectors (back), timestamp, text (front)
def dispatch_seeds():
    a = "0123456789ABCDEF0123456789ABCDEF"
    b = "FEDCBA9876543210FEDCBA9876543210"
    texts = {
        "hashed_S": "pw" + SEP + "salt" + SEP + "S",
        "hashed_F": "password1" + SEP + "pepper" + SEP + "F",
        "hashed_21": "pw" + SEP + "a" + SEP,
        "hashed_plain": "plain-text",
        "type68": "1" + SEP + a + SEP + b + SEP + "123456",
        "type68_alt": "0" + SEP + a + SEP + b + SEP + "1234",
        "type68_long_pin": "1" + SEP + a + SEP + b + SEP + "1234567890123",
    }
    for type_index, type_name in enumerate(["t47", "t48", "t55", "t59", "t68"]):
        for name, text in texts.items():
            if (type_name == "t68") != name.startswith("type68"):
                continue
            p = Provider()
            p.integer(0, 255, type_index)      # type selector
            p.integer(0, 255, 0x00)            # keys: default app, 1024-bit enc
            p.integer(0, 255, 1)               # a timestamp is present
            p.string("20240101120000")
            p.rest(text)
            write("dispatch", "%s_%s" % (type_name, name), p.bytes())
    p = Provider()
    p.integer(0, 255, 5)
    p.integer(-2, 92, 38)
    p.integer(0, 255, 0x05)
    p.integer(0, 255, 1)
    p.string("1700000000")
    p.rest("123456")
    write("dispatch", "t38_2048", p.bytes())
    p = Provider()
    p.integer(0, 255, 1)
    p.integer(0, 255, 0x0F)                    # both slots take the fuzzed modulus
    p.integer(0, 255, 1)
    p.string("20240101")
    p.string("C0FFEE")
    p.rest("pw" + SEP + "salt" + SEP + "S")
    write("dispatch", "fuzzed_modulus", p.bytes())


# ---- session_fuzzer: steps of (op, session, arguments)
OPS = ["create", "destroy", "accepts", "limits", "kbdtype", "kbdstyle", "modes", "strings",
       "hashrandom", "keys", "ecc", "surface", "build", "touch", "burst", "clear", "output",
       "pincode", "measure", "degree", "verify", "prefill", "tap"]
OP_COUNT = 22 + 8
PATTERNS = ["[:print:]*", "[0-9]*", "[:digit:]{0,6}", ".*", "[a-z]+", "[:alnum:]{0,8}",
            "[:print:]*[:digit:]+[:print:]*", "([a-z]|[0-9])*", "[:^space:]*+", ""]
LETTERS = ["qwertyuiop", "asdfghjkl", "zxcvbnm"]


class Session:
    def __init__(self):
        self.p = Provider()

    def op(self, name, which=0):
        self.p.integer(0, OP_COUNT - 1, OPS.index(name))
        self.p.integer(0, 3, which)
        return self

    def text(self, s):
        self.p.integer(0, 15, 1)     # not null
        self.p.string(s)

    def setup(self, which=0, pattern=0, width=1080, height=640):
        self.op("create", which)
        self.op("accepts", which)
        self.p.boolean(True)
        self.p.integer(0, len(PATTERNS) - 1, pattern)
        self.op("limits", which)                # maxLength 64 (the default 0 takes nothing)
        self.p.integer(-32768, 32767, 64)
        self.p.integer(-32768, 32767, 0)
        self.op("build", which)                 # surface created, then surface changed
        self.op("surface", which)
        self.p.integer(1, 4000, width)
        self.p.integer(1, 4000, height)
        self.p.integer(-1, 3, 0)
        return self

    def tap(self, fx, fy, which=0):
        self.op("tap", which)
        self.p.integer(0, 39, fx)
        self.p.integer(0, 15, fy)
        return self

    def key(self, ch, which=0):
        for row, keys in enumerate(LETTERS):
            if ch in keys:
                col = keys.index(ch)
                fx = [4 * col + 1, 4 * col + 3, 4 * col + 7][row]
                return self.tap(fx, 4 * row + 1, which)
        raise ValueError(ch)

    def pad(self, digit, which=0):
        pos = "123456789" .find(digit)
        row, col = (3, 0) if digit == "0" else (pos // 3, pos % 3)
        return self.tap(10 * col + 5, 4 * row + 1, which)

    def output(self, type_, which=0, ts="20240101120000"):
        self.op("output", which)
        self.p.boolean(type_ == 48)
        self.p.boolean(False)
        self.text(ts)
        return self

    def getters(self, which=0):
        for name in ["measure", "degree", "verify", "pincode"]:
            self.op(name, which)
        self.output(48, which)
        self.output(47, which)
        return self


def session_seeds():
    s = Session().setup()
    for ch in "password":
        s.key(ch)
    s.getters()
    s.op("strings"); s.p.integer(0, 3, 0); s.text("challenge")
    s.op("pincode")
    s.op("keys"); s.p.integer(0, 2, 0); s.p.integer(0, 3, 0)      # encryPlat = built-in modulus
    s.output(47)
    s.tap(36, 13)                                                 # done
    write("session", "type_and_output", s.p.bytes())

    s = Session().setup()
    s.op("hashrandom"); s.text("salt"); s.p.integer(0, 4, 0)      # "1:salt"
    for ch in "pw":
        s.key(ch)
    s.op("keys"); s.p.integer(0, 2, 1); s.p.integer(0, 3, 0)      # 2048-bit encryPlat
    s.getters()
    write("session", "salted_hash", s.p.bytes())

    s = Session().setup(which=1, pattern=1)
    s.op("kbdtype", 1); s.p.boolean(True); s.p.integer(0, 2, 1)
    for d in "1234":
        s.pad(d, 1)
    s.tap(15, 13, 1)                                              # "."
    s.tap(35, 1, 1)                                               # delete
    s.getters(1)
    s.tap(35, 5, 1)                                               # clear
    s.tap(35, 9, 1)                                               # done
    write("session", "number_pad", s.p.bytes())

    s = Session().setup(which=2)
    s.op("modes", 2); s.p.integer(-32768, 32767, 1); s.p.integer(0, 7, 0)   # switchMode 1
    s.tap(2, 13, 2)                                               # switch: digits-only pad
    s.pad("7", 2)
    s.tap(35, 5, 2)                                               # back to letters
    s.key("a", 2)
    s.tap(2, 9, 2)                                                # shift
    s.key("b", 2)
    s.tap(20, 13, 2)                                              # space
    s.tap(38, 9, 2)                                               # delete
    s.getters(2)
    write("session", "switch_modes", s.p.bytes())

    s = Session().setup(pattern=0)
    s.op("limits"); s.p.integer(-32768, 32767, 6); s.p.integer(-32768, 32767, 4)
    for ch in "abcdefgh":
        s.key(ch)
    s.op("verify")
    s.op("kbdstyle"); s.p.integer(-5, 5, 2); s.p.boolean(True)
    s.op("build")
    s.tap(2, 13)
    write("session", "max_length", s.p.bytes())

    s = Session().setup()
    s.op("limits"); s.p.integer(-32768, 32767, 5000); s.p.integer(-32768, 32767, 0)
    s.op("prefill"); s.p.integer(0, 4092, 4088); s.p.integer(0x20, 0x7E, ord("k"))
    s.op("burst"); s.p.integer(1, 64, 8); s.p.integer(0, 39, 1); s.p.integer(0, 15, 1)
    s.op("measure")
    s.output(48)
    write("session", "full_capacity", s.p.bytes())

    s = Session().setup(0).setup(3, pattern=5)
    for k, ch in enumerate("qwerty"):
        s.key(ch, k % 2 * 3)
    s.op("destroy", 0)
    s.op("create", 0)
    s.op("ecc", 3); s.text("04AB"); s.text("CDEF01")
    s.op("touch", 3); s.p.integer(-1, 3, 1); s.p.integer(0, 7, 0); s.p.integer(0, 7, 0)  # NaN
    s.getters(3)
    write("session", "two_sessions", s.p.bytes())


if __name__ == "__main__":
    der_seeds()
    codec_seeds()
    pattern_seeds()
    dispatch_seeds()
    session_seeds()
