package com.qn.tessel.test;

import static com.qn.tessel.test.JvmSuite.TIMESTAMP;

import com.qn.tessel.server.OpenException;
import com.qn.tessel.server.TesselOpener;
import java.io.ByteArrayOutputStream;
import java.math.BigInteger;
import java.security.interfaces.RSAPrivateCrtKey;
import java.util.ArrayList;
import java.util.Arrays;
import java.util.Base64;
import java.util.List;
import java.util.Random;
import java.util.Set;
import javax.crypto.Cipher;
import javax.crypto.spec.SecretKeySpec;

/**
 * The attacker's side: envelopes whose RSA block fails in each way a padding oracle tells apart
 * (bad padding, a key of the wrong length, a wrong 16-byte key), made for every envelope type and
 * opened by both openers, which must give the one answer; and a seeded random mutation of library
 * outputs through the Java opener, where every failure after a valid outer layout must be that
 * answer and nothing else may escape.
 */
final class ForgeryTests {
  private ForgeryTests() {}

  static final Random RANDOM = new Random(20261125);
  static final String REJECTED = "Rejected: output rejected";
  /** Envelope types whose payload is an RSA value, not the text. */
  static final Set<Integer> RSA_PAYLOAD = Set.of(2, 20, 27, 81, 33, 12, 42, 10, 28, 36, 40, 50, 74, 82, 86, 8, 51, 46, 5,
      19, 38, 68, 47, 55);

  /** The RSA block 00 02 PS 00 M, or with the given second byte (02 is valid). */
  static byte[] block(int k, int second, byte[] m) {
    byte[] b = new byte[k];
    b[1] = (byte) second;
    for (int i = 2; i < k - m.length - 1; ++i) b[i] = (byte) (1 + RANDOM.nextInt(255));
    System.arraycopy(m, 0, b, k - m.length, m.length);
    return b;
  }

  /** An envelope of `content` under `rc4Key`, its key block being `block` under the app key. */
  static String envelope(byte[] block, byte[] rc4Key, int drop, byte[] content) throws Exception {
    RSAPrivateCrtKey app = JvmSuite.appKey;
    byte[] c = new BigInteger(1, block).modPow(app.getPublicExponent(), app.getModulus()).toByteArray();
    byte[] wrapped = new byte[block.length];
    for (int i = 0; i < block.length && i < c.length; ++i) wrapped[i] = c[c.length - 1 - i];  // least significant first
    Cipher rc4 = Cipher.getInstance("ARCFOUR");
    rc4.init(Cipher.ENCRYPT_MODE, new SecretKeySpec(rc4Key, "ARCFOUR"));
    rc4.update(new byte[drop]);
    ByteArrayOutputStream out = new ByteArrayOutputStream();
    out.write(Bank.ascii(String.format("%08d", block.length + 12)));
    out.write(new byte[] {1, 2, 0, 0, 1, 0x68, 0, 0, 0, (byte) 0xA4, 0, 0});
    out.write(wrapped);
    out.write(Bank.ascii(String.format("%08d", content.length)));
    out.write(rc4.doFinal(content));
    return Base64.getEncoder().encodeToString(out.toByteArray());
  }

  static String javaAnswer(int type, String output) {
    try {
      final boolean stamped = !List.of(3, 29, 30, 56, 73, 88).contains(type);
      JvmSuite.opener.open(type, output, new TesselOpener.Options(false, stamped ? TIMESTAMP : null)).close();
      return "opened";
    } catch (OpenException e) {
      return e.getClass().getSimpleName() + ": " + e.getMessage() + (e.getCause() == null ? "" : " caused");
    }
  }

  static void run() {
    Check.test("forged envelope keys of every type: one answer from both openers", () -> {
      final int k = JvmSuite.appKeyBytes();
      final byte[] key = new byte[16];
      RANDOM.nextBytes(key);
      final byte[] content = Bank.ascii("S" + TIMESTAMP + ":Tessel 7!");
      final String[] classes = {"valid", "bad padding", "15-byte key", "wrong 16-byte key"};
      int forged = 0;
      for (int type = 0; type <= 90; ++type) {
        if (OutputTests.NO_OUTPUT.contains(type) || List.of(3, 4, 22, 29, 30, 56, 73).contains(type)) continue;
        for (int c = 0; c < classes.length; ++c) {
          byte[] m = c == 2 ? Arrays.copyOf(key, 15) : c == 3 ? Arrays.copyOf(Bank.digest("MD5", key), 16) : key;
          String out = envelope(block(k, c == 1 ? 3 : 2, m), key, TesselOpener.drop(type), content);
          // Type 88 has no structure: any key opens it (to noise under a synthetic key, the same in both).
          final boolean opens = (c == 0 && !RSA_PAYLOAD.contains(type)) || type == 88;
          final String expected = opens ? "opened" : REJECTED;
          Check.equal(expected, javaAnswer(type, out), "Java, type " + type + ", " + classes[c]);
          Bank.Result r = Bank.open(type, out, true, type == 88 ? new String[0] : new String[] {"--timestamp", TIMESTAMP});
          Check.equal(expected.equals("opened") ? "" : "tessel_open: output rejected", r.stderr(), "C++, type " + type + ", " + classes[c]);
          ++forged;
        }
      }
      System.out.println("    " + forged + " forged envelopes");
    });

    Check.test("seeded random mutations: every failure after a valid outer layout is the one answer", () -> {
      final int[] types = {48, 47, 10, 12, 8, 46, 5, 19, 38, 88, 3, 4, 30, 73};
      final List<String> problems = new ArrayList<>();
      int rejected = 0;
      int opened = 0;
      for (int round = 0; round < 3000; ++round) {
        final int type = types[round % types.length];
        String out = OutputTests.dispatch(type, JvmSuite.appModulusHex, JvmSuite.encModulusHex, "7391", TIMESTAMP);
        final boolean direct = List.of(3, 4, 30, 73).contains(type);
        final boolean base64 = !direct || type != 30;
        byte[] raw = base64 ? Base64.getDecoder().decode(out) : Bank.ascii(out);
        switch (RANDOM.nextInt(4)) {
          case 0 -> raw[RANDOM.nextInt(raw.length)] ^= (byte) (1 << RANDOM.nextInt(8));
          case 1 -> raw[RANDOM.nextInt(raw.length)] = (byte) RANDOM.nextInt(256);
          case 2 -> raw = Arrays.copyOf(raw, RANDOM.nextInt(raw.length));
          default -> raw[raw.length - 1 - RANDOM.nextInt(Math.min(raw.length, 40))] ^= (byte) (1 + RANDOM.nextInt(255));
        }
        String mutated = base64 ? Base64.getEncoder().encodeToString(raw) : Bank.latin1(raw);
        String answer;
        try {
          answer = javaAnswer(type, mutated);
        } catch (RuntimeException e) {
          answer = "threw " + e;
        }
        final boolean publicBytesSound = direct ? directSound(type, raw) : layoutSound(mutated);
        if (answer.equals("opened")) ++opened;
        else if (answer.equals(REJECTED)) ++rejected;
        else if (publicBytesSound || answer.startsWith("threw") || answer.endsWith("caused")) problems.add(type + " " + answer);
      }
      Check.equal(List.of(), problems, "answers that break the rule");
      Check.isTrue(rejected > 1000, "most mutations reach the rejection: " + rejected + ", opened " + opened);
    });
  }

  /** A direct output whose own bytes are sound: the RSA value's encoding and length. */
  private static boolean directSound(int type, byte[] raw) {
    if (type != 30) return raw.length == (type == 73 ? JvmSuite.appKeyBytes() : JvmSuite.encKeyBytes);
    return raw.length == 2 * JvmSuite.encKeyBytes && Bank.latin1(raw).matches("[0-9A-Fa-f]*");
  }

  private static boolean layoutSound(String envelope) {
    try {
      return TesselOpener.layout(envelope).rsaLength() == JvmSuite.appKeyBytes();
    } catch (OpenException e) {
      return false;
    }
  }
}
