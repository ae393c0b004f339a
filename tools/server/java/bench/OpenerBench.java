import com.qn.tessel.server.OpenException;
import com.qn.tessel.server.Opened;
import com.qn.tessel.server.PemKeys;
import com.qn.tessel.server.TesselOpener;
import com.sun.management.OperatingSystemMXBean;
import java.lang.management.ManagementFactory;
import java.nio.file.Files;
import java.nio.file.Path;

/**
 * Envelopes opened per second by the Java opener, on the envelopes bench/opener_bench.cpp wrote:
 * {@code OpenerBench KEY.pem ENVELOPE.txt LABEL ...}. Each case warms the JIT for two seconds,
 * then counts for three; prints "LABEL opens_per_second", per second of the process's CPU time
 * (garbage collector included) as Google Benchmark reports its rates, so a loaded machine skews
 * neither side.
 */
public final class OpenerBench {
  private OpenerBench() {}

  /** Opens the envelope repeatedly for `nanos`; returns the count. */
  private static long run(TesselOpener opener, String envelope, long nanos) throws OpenException {
    long count = 0;
    int sink = 0;
    final long end = System.nanoTime() + nanos;
    while (System.nanoTime() < end) {
      try (Opened o = opener.open(48, envelope)) {
        sink += o.contentOpened() ? 1 : 0;
      }
      ++count;
    }
    if (sink == 0) throw new IllegalStateException("nothing opened");
    return count;
  }

  /**
   * Runs the cases.
   *
   * @param args triples of key file, envelope file and label
   * @throws Exception when a key or envelope cannot be read or opened
   */
  public static void main(String[] args) throws Exception {
    for (int k = 0; k + 2 < args.length; k += 3) {
      TesselOpener opener = TesselOpener.builder().appKey(PemKeys.read(Path.of(args[k]))).build();
      String envelope = Files.readString(Path.of(args[k + 1])).trim();
      run(opener, envelope, 2_000_000_000L);
      final OperatingSystemMXBean os = (OperatingSystemMXBean) ManagementFactory.getOperatingSystemMXBean();
      final long t0 = os.getProcessCpuTime();
      final long n = run(opener, envelope, 3_000_000_000L);
      System.out.printf("%s %.1f%n", args[k + 2], n * 1e9 / (os.getProcessCpuTime() - t0));
    }
  }
}
