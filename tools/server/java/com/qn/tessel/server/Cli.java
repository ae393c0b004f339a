package com.qn.tessel.server;

import java.io.IOException;
import java.io.InputStream;
import java.io.PrintStream;
import java.nio.charset.StandardCharsets;
import java.nio.file.Path;
import java.security.GeneralSecurityException;

/**
 * {@code java -jar tessel-server.jar}: opens one output on the command line, with the options
 * and exit codes of the C++ tessel_open. It prints "field: value" lines (strength, timestamp,
 * payload, content, password) and exits 0; on failure one line "tessel-server: reason" on
 * stderr and 1 (bad or foreign output), 2 (bad usage) or 3 (password mismatch).
 */
public final class Cli {
  private Cli() {}

  private static final String USAGE =
      "usage: java -jar tessel-server.jar [--type N] --key APP.pem [--enc-key ENC.pem]\n"
      + "         [--pin-key HEX | --master-key HEX --wrapped-working-key HEX --wrapped-pin-key HEX]\n"
      + "         [--password TEXT [--salt TEXT] [--mode S|F]] [--layout] OUTPUT|-\n"
      + "  --type N      encryption type the output was made with (default 48)\n"
      + "  --key         application-platform private key (opens envelopes, types 56 and 73)\n"
      + "  --enc-key     encryption-platform private key (opens RSA payloads, types 3 4 22 29 30)\n"
      + "  --pin-key     type 68: the 16-byte PIN key as 32 hex digits, or derive it from the\n"
      + "                master key and the two wrapped keys the app was given\n"
      + "  --password    check the opened content against a stored password (see PasswordCheck)\n"
      + "  --layout      only decode the envelope and print its field lengths\n"
      + "  OUTPUT        the text returned by the library, or - to read it from stdin\n";

  /** Usage errors end the run with exit code 2. */
  private static final class Usage extends Exception {
    private static final long serialVersionUID = 1L;

    Usage(String message) {
      super(message);
    }
  }

  /**
   * Runs the command line and exits with its status.
   *
   * @param args the options and the output
   */
  public static void main(String[] args) {
    System.exit(run(args, System.in, System.out, System.err));
  }

  /**
   * Runs the command line in-process.
   *
   * @param args the options and the output
   * @param in where "-" reads the output from
   * @param out where the fields go
   * @param err where the one-line reason goes
   * @return the exit status
   */
  public static int run(String[] args, InputStream in, PrintStream out, PrintStream err) {
    try {
      return open(args, in, out, err);
    } catch (Usage | IllegalArgumentException | IllegalStateException e) {
      err.println("tessel-server: " + e.getMessage());
      return 2;
    } catch (OpenException e) {
      err.println("tessel-server: " + e.getMessage());
      return 1;
    } catch (IOException e) {
      err.println("tessel-server: cannot read the output: " + e.getMessage());
      return 2;
    }
  }

  /** Content bytes as text when printable, else as hex. */
  static String printable(String s) {
    for (int k = 0; k < s.length(); ++k) {
      char c = s.charAt(k);
      if (c < 0x20 || c > 0x7E) return "hex:" + Bytes.toHex(Bytes.latin1(s), true);
    }
    return s;
  }

  private static int open(String[] args, InputStream in, PrintStream out, PrintStream err)
      throws Usage, OpenException, IOException {
    int type = 48;
    String keyPath = null;
    String encPath = null;
    String pinKeyHex = null;
    String masterHex = null;
    String aHex = null;
    String bHex = null;
    String password = null;
    String salt = null;
    String output = null;
    char mode = 'S';
    boolean layoutOnly = false;
    for (int k = 0; k < args.length; ++k) {
      final String arg = args[k];
      final boolean hasValue = k + 1 < args.length;
      switch (arg) {
        case "--help": case "-h":
          out.print(USAGE);
          return 0;
        case "--layout":
          layoutOnly = true;
          continue;
        case "--type": case "--key": case "--enc-key": case "--pin-key": case "--master-key":
        case "--wrapped-working-key": case "--wrapped-pin-key": case "--password": case "--salt": case "--mode":
          if (!hasValue) throw new Usage(arg + " needs a value");
          break;
        default:
          if (arg.startsWith("-") && !arg.equals("-")) throw new Usage("unknown option " + arg + " (see --help)");
          if (output != null) throw new Usage("more than one OUTPUT given");
          output = arg;
          continue;
      }
      final String v = args[++k];
      switch (arg) {
        case "--type":
          try {
            type = Integer.parseInt(v);
          } catch (NumberFormatException e) {
            throw new Usage("--type needs a number");
          }
          break;
        case "--key": keyPath = v; break;
        case "--enc-key": encPath = v; break;
        case "--pin-key": pinKeyHex = v; break;
        case "--master-key": masterHex = v; break;
        case "--wrapped-working-key": aHex = v; break;
        case "--wrapped-pin-key": bHex = v; break;
        case "--password": password = v; break;
        case "--salt": salt = v; break;
        default:
          if (!v.equals("S") && !v.equals("F")) throw new Usage("--mode is S or F");
          mode = v.charAt(0);
          break;
      }
    }
    if (output == null) throw new Usage("no OUTPUT given (see --help)");
    if (output.equals("-")) output = new String(in.readAllBytes(), StandardCharsets.ISO_8859_1);
    output = output.replaceAll("[\r\n ]+$", "");
    if (salt != null && password == null) throw new Usage("--salt needs --password");

    if (layoutOnly) {
      TesselOpener.Layout l = TesselOpener.layout(output);
      out.printf("key-blob-length: %d%nrsa-length: %d%ncontent-length: %d%ntotal-length: %d%n",
          l.keyBlobLength(), l.rsaLength(), l.contentLength(), l.totalLength());
      return 0;
    }
    TesselOpener.Builder keys = TesselOpener.builder();
    if (keyPath != null) keys.appKey(key(keyPath));
    if (encPath != null) keys.encKey(key(encPath));
    if (pinKeyHex != null) {
      if (pinKeyHex.length() != 32) throw new Usage("--pin-key must be 32 hex digits");
      byte[] pin;
      try {
        pin = Bytes.fromHex(pinKeyHex, "--pin-key");
      } catch (OpenException.BadEncoding e) {
        throw new Usage("--pin-key must be 32 hex digits");
      }
      keys.pinKey(pin);
      Bytes.wipe(pin);
    } else if (masterHex != null || aHex != null || bHex != null) {
      try {
        keys.pinKey(masterHex, aHex, bHex);
      } catch (OpenException.BadEncoding e) {
        throw new Usage(e.getMessage());
      }
    }
    final Opened opened = keys.build().open(type, output);
    if (opened.wrapped()) {
      out.printf("strength: %c%ntimestamp: %s%npayload: %s%n", opened.strength(), opened.timestamp(),
          printable(opened.payload()));
    } else if (!opened.timestamp().isEmpty()) {
      out.printf("timestamp: %s%n", opened.timestamp());
    }
    if (opened.contentOpened()) out.printf("content: %s%n", printable(opened.content()));
    if (password == null) return 0;
    if (!opened.contentOpened()) throw new Usage("the payload is sealed: give --enc-key");
    final boolean match = PasswordCheck.matches(opened, password, salt == null ? "" : salt, mode);
    out.printf("password: %s%n", match ? "match" : "mismatch");
    if (match) return 0;
    err.println("tessel-server: the password does not match");
    return 3;
  }

  private static java.security.PrivateKey key(String path) throws Usage {
    try {
      return PemKeys.read(Path.of(path));
    } catch (IOException e) {
      throw new Usage("cannot read " + path);
    } catch (GeneralSecurityException e) {
      throw new Usage(path + ": " + e.getMessage());
    }
  }
}
