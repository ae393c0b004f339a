import com.qn.tessel.server.OpenException;
import com.qn.tessel.server.Opened;
import com.qn.tessel.server.PemKeys;
import com.qn.tessel.server.TesselOpener;
import java.io.ByteArrayOutputStream;
import java.math.BigInteger;
import java.nio.charset.StandardCharsets;
import java.nio.file.Path;
import java.security.interfaces.RSAPrivateCrtKey;
import java.util.Arrays;
import java.util.Base64;
import java.util.Random;
import javax.crypto.Cipher;
import javax.crypto.spec.SecretKeySpec;

/**
 * Whether the Java opener's time tells a forged envelope from a genuine one, as
 * bench/opener_timing_bench.cpp asks of the C++ opener: four classes of type-48 envelope (valid;
 * bad PKCS#1 padding; good padding around a 15-byte key; good padding around a wrong 16-byte key),
 * OPENS of each (default 20,000; TESSEL_TIMING_OPENS overrides) in interleaved rounds whose class
 * order is shuffled, each open timed on its own after a JIT warm-up. Per class the median, and for
 * each forged class the median difference to the valid class with a bootstrap 95% confidence
 * interval (1,000 resamples), in the C++ bench's line format so one parser reads both. Target on
 * a quiet machine: every interval contains 0 and lies within ±200 ns.
 * {@code java -cp tessel-server.jar:. TimingBench KEY.pem...} (one key per size).
 */
public final class TimingBench {
  private TimingBench() {}

  private static final String[] NAMES = {"valid", "bad_padding", "wrong_length_key", "wrong_16_byte_key"};
  private static final int PER_CLASS = 256;
  private static final int WARM_UP = 3000;

  /** 00 02 | non-zero filler | 00 | message, or 00 01 ... for a bad block type. */
  private static byte[] padded(int k, byte[] message, boolean badType, Random rng) {
    byte[] b = new byte[k];
    b[1] = (byte) (badType ? 1 : 2);
    for (int i = 2; i < k - message.length - 1; ++i) b[i] = (byte) (1 + rng.nextInt(255));
    System.arraycopy(message, 0, b, k - message.length, message.length);
    return b;
  }

  private static String envelope(RSAPrivateCrtKey key, byte[] block, byte[] rc4Key, byte[] content) throws Exception {
    final int k = block.length;
    byte[] c = new BigInteger(1, block).modPow(key.getPublicExponent(), key.getModulus()).toByteArray();
    byte[] reversed = new byte[k];
    for (int i = 0; i < k && i < c.length; ++i) reversed[i] = c[c.length - 1 - i];
    Cipher rc4 = Cipher.getInstance("ARCFOUR");
    rc4.init(Cipher.ENCRYPT_MODE, new SecretKeySpec(rc4Key, "ARCFOUR"));
    rc4.update(new byte[512]);
    ByteArrayOutputStream raw = new ByteArrayOutputStream();
    raw.write(String.format("%08d", k + 12).getBytes(StandardCharsets.US_ASCII));
    raw.write(new byte[] {1, 2, 0, 0, 1, 0x68, 0, 0, 0, (byte) 0xA4, 0, 0});
    raw.write(reversed);
    raw.write(String.format("%08d", content.length).getBytes(StandardCharsets.US_ASCII));
    raw.write(rc4.doFinal(content));
    return Base64.getEncoder().encodeToString(raw.toByteArray());
  }

  private static double median(double[] v) {
    double[] s = v.clone();
    Arrays.sort(s);
    return s[s.length / 2];
  }

  private static void run(Path pem, int opens, Random rng) throws Exception {
    final RSAPrivateCrtKey key = (RSAPrivateCrtKey) PemKeys.read(pem);
    final int k = (key.getModulus().bitLength() + 7) / 8;
    final TesselOpener opener = TesselOpener.builder().appKey(key).build();
    final byte[] content = "S1700000000:Kqhzmw7!pepper".getBytes(StandardCharsets.US_ASCII);
    String[][] envelopes = new String[NAMES.length][PER_CLASS];
    for (int e = 0; e < PER_CLASS; ++e) {
      byte[] rc4 = new byte[16];
      byte[] other = new byte[16];
      rng.nextBytes(rc4);
      rng.nextBytes(other);
      byte[] short15 = Arrays.copyOf(rc4, 15);
      envelopes[0][e] = envelope(key, padded(k, rc4, false, rng), rc4, content);
      envelopes[1][e] = envelope(key, padded(k, rc4, true, rng), rc4, content);
      envelopes[2][e] = envelope(key, padded(k, short15, false, rng), short15, content);
      envelopes[3][e] = envelope(key, padded(k, other, false, rng), rc4, content);
    }
    double[][] samples = new double[NAMES.length][opens];
    Integer[] order = {0, 1, 2, 3};
    long sink = 0;
    for (int round = 0; round < opens + WARM_UP; ++round) {
      java.util.Collections.shuffle(Arrays.asList(order), rng);
      for (int c : order) {
        final String output = envelopes[c][round % PER_CLASS];
        final long t0 = System.nanoTime();
        try (Opened o = opener.open(48, output)) {
          sink += o.type();
        } catch (OpenException.Rejected e) {
          sink -= 1;
        }
        final long t1 = System.nanoTime();
        if (round >= WARM_UP) samples[c][round - WARM_UP] = t1 - t0;
      }
    }
    final double valid = median(samples[0]);
    System.out.printf("%d-bit key, %d opens per class: valid median %.0f ns%s%n", k * 8, opens, valid,
        sink == 0 ? " " : "");
    double[] a = new double[opens];
    double[] b = new double[opens];
    for (int c = 1; c < NAMES.length; ++c) {
      final double diff = median(samples[c]) - valid;
      double[] boot = new double[1000];
      for (int r = 0; r < boot.length; ++r) {
        for (int i = 0; i < opens; ++i) {
          a[i] = samples[c][rng.nextInt(opens)];
          b[i] = samples[0][rng.nextInt(opens)];
        }
        boot[r] = median(a) - median(b);
      }
      Arrays.sort(boot);
      final double lo = boot[24];
      final double hi = boot[974];
      System.out.printf("  %-18s median %.0f ns, difference %+.1f ns, 95%% CI [%+.1f, %+.1f]%s%n", NAMES[c],
          median(samples[c]), diff, lo, hi, lo <= 0 && hi >= 0 && lo >= -200 && hi <= 200 ? "" : "  (outside target)");
    }
  }

  /**
   * Runs the classes for each key.
   *
   * @param args PEM files of the keys (1024 and 2048 bits)
   * @throws Exception when a key cannot be read
   */
  public static void main(String[] args) throws Exception {
    final String env = System.getenv("TESSEL_TIMING_OPENS");
    final int opens = env == null ? 20000 : Integer.parseInt(env);
    final Random rng = new Random(48);
    for (String pem : args) run(Path.of(pem), opens, rng);
  }
}
