package com.qn.tessel.server;

import java.io.ByteArrayOutputStream;
import java.io.IOException;
import java.io.InputStream;
import java.io.PrintStream;
import java.nio.charset.StandardCharsets;
import java.nio.file.Files;
import java.nio.file.Path;
import java.security.GeneralSecurityException;
import java.security.PrivateKey;
import java.util.HashMap;
import java.util.Map;
import java.util.Set;

/**
 * {@code java -jar tessel-server.jar}: opens one output on the command line, with the options
 * and exit codes of the C++ tessel_open. On success it prints "field: value" lines (strength,
 * timestamp, payload, content, password) and exits 0. Otherwise one line "tessel-server: reason"
 * on stderr and 1 (the output's own bytes are bad: too long, not base64, wrong header or lengths,
 * another key's size), 2 (bad usage, unreadable key or file) or 3 ("output rejected": anything
 * from the private-key operation on, a wrong password included, with nothing on stdout).
 */
public final class Cli {
  private Cli() {}

  private static final String USAGE =
      "usage: java -jar tessel-server.jar [--type N] --key APP.pem [--enc-key ENC.pem]\n"
      + "         [--pin-key HEX | --pin-key-file PATH |\n"
      + "          --master-key HEX|--master-key-file PATH --wrapped-working-key HEX --wrapped-pin-key HEX]\n"
      + "         [--salt TEXT] [--timestamp TEXT] [--password TEXT | --password-file PATH [--mode S|F]]\n"
      + "         [--layout] OUTPUT|-\n"
      + "       java -jar tessel-server.jar --challenge TEXT|--challenge-file PATH [--password...] OUTPUT|-\n"
      + "  --type N      encryption type the output was made with (default 48)\n"
      + "  --key         application-platform private key (opens envelopes, types 56 and 73)\n"
      + "  --enc-key     encryption-platform private key (opens RSA payloads, types 3 4 22 29 30)\n"
      + "  --pin-key     type 68: the 16-byte PIN key as 32 hex digits, or derive it from the\n"
      + "                master key and the two wrapped keys the app was given\n"
      + "  --salt        the app set this hash salt: types 48 and 59 carry the salted-hash hex\n"
      + "  --timestamp   the timestamp the server issued: the output must carry exactly it\n"
      + "  --password    check the opened content against a stored password: the salted MD5 value\n"
      + "                for types 47 48 55 59 (with --salt and --mode), SHA-1 for type 5, the text\n"
      + "  --challenge   open OUTPUT as getNativeEncryptedPinCode's value under this challenge code\n"
      + "  --layout      only decode the envelope and print its field lengths\n"
      + "  OUTPUT        the text returned by the library, or - to read it from stdin\n"
      + "The *-file forms read the value from PATH (- for stdin when OUTPUT is not -), at most 4096\n"
      + "bytes, minus one final newline: prefer them, any local user can read a command line.\n"
      + "Exit status: 0 opened, 1 bad output bytes, 2 bad usage, 3 output rejected (any failure\n"
      + "after the private-key operation, a wrong password included).\n";

  private static final int MAX_SECRET_FILE = 4096;
  /** Options that take a value; the *-file ones name a file holding it. */
  private static final Set<String> VALUED = Set.of("--type", "--key", "--enc-key", "--pin-key", "--pin-key-file",
      "--master-key", "--master-key-file", "--wrapped-working-key", "--wrapped-pin-key", "--password",
      "--password-file", "--salt", "--mode", "--timestamp", "--challenge", "--challenge-file");

  /** Usage errors end the run with exit code 2. */
  private static final class Usage extends Exception {
    private static final long serialVersionUID = 1L;

    Usage(String message) {
      super(message);
    }

    Usage(String message, Throwable cause) {
      super(message, cause);
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
   * @param in where "-" reads the output (or a *-file value) from
   * @param out where the fields go
   * @param err where the one-line reason goes
   * @return the exit status
   */
  public static int run(String[] args, InputStream in, PrintStream out, PrintStream err) {
    Map<String, byte[]> secrets = new HashMap<>();
    Fields fields = new Fields();
    try {
      final int status = open(args, in, new PrintStream(fields, true, StandardCharsets.ISO_8859_1), secrets);
      fields.writeTo(out);
      out.flush();
      return status;
    } catch (OpenException.Rejected e) {
      err.println("tessel-server: " + e.getMessage());
      return 3;
    } catch (OpenException e) {
      err.println("tessel-server: " + e.getMessage());
      return 1;
    } catch (Usage | IllegalArgumentException | IllegalStateException e) {
      err.println("tessel-server: " + e.getMessage());
      return 2;
    } catch (IOException e) {
      err.println("tessel-server: cannot read the output: " + e.getMessage());
      return 2;
    } finally {
      secrets.values().forEach(Bytes::wipe);
      fields.wipe();
    }
  }

  /** The lines of one run, held back until the run succeeded (a rejection prints none), then wiped. */
  private static final class Fields extends ByteArrayOutputStream {
    void wipe() {
      Bytes.wipe(buf);
    }
  }

  /** Content bytes as text when printable, else as upper-case hex. */
  static void printable(PrintStream out, byte[] bytes) {
    boolean text = true;
    for (byte b : bytes) text &= b >= 0x20 && b <= 0x7E;
    if (!text) out.print("hex:");
    for (byte b : bytes) {
      if (text) {
        out.write(b);
      } else {
        out.write("0123456789ABCDEF".charAt((b >> 4) & 15));
        out.write("0123456789ABCDEF".charAt(b & 15));
      }
    }
    out.print('\n');
  }

  /** At most max bytes of the stream (one more tells the caller it was longer). */
  private static byte[] readAtMost(InputStream in, int max) throws IOException {
    return in.readNBytes(max);
  }

  /** A *-file value: the file's bytes minus one final "\n" or "\r\n". */
  private static byte[] secretFile(String path, InputStream in, boolean outputOnStdin) throws Usage {
    if (path.equals("-") && outputOnStdin) throw new Usage("only one of OUTPUT and a *-file can be read from stdin");
    byte[] raw;
    try (InputStream s = path.equals("-") ? null : Files.newInputStream(Path.of(path))) {
      raw = readAtMost(s == null ? in : s, MAX_SECRET_FILE + 1);
    } catch (IOException e) {
      throw new Usage("cannot read " + path, e);
    }
    if (raw.length > MAX_SECRET_FILE) {
      Bytes.wipe(raw);
      throw new Usage(path + " holds more than " + MAX_SECRET_FILE + " bytes");
    }
    int n = raw.length;
    if (n > 0 && raw[n - 1] == '\n') n -= n > 1 && raw[n - 2] == '\r' ? 2 : 1;
    byte[] value = java.util.Arrays.copyOf(raw, n);
    Bytes.wipe(raw);
    return value;
  }

  private static int open(String[] args, InputStream in, PrintStream out, Map<String, byte[]> secrets)
      throws Usage, OpenException, IOException {
    Map<String, String> opt = new HashMap<>();
    String output = null;
    boolean layoutOnly = false;
    for (int k = 0; k < args.length; ++k) {
      final String arg = args[k];
      if (arg.equals("--help") || arg.equals("-h")) {
        out.print(USAGE);
        return 0;
      } else if (arg.equals("--layout")) {
        layoutOnly = true;
      } else if (VALUED.contains(arg)) {
        if (k + 1 >= args.length) throw new Usage(arg + " needs a value");
        opt.put(arg, args[++k]);
      } else if (arg.startsWith("-") && !arg.equals("-")) {
        throw new Usage("unknown option " + arg + " (see --help)");
      } else if (output != null) {
        throw new Usage("more than one OUTPUT given");
      } else {
        output = arg;
      }
    }
    if (output == null) throw new Usage("no OUTPUT given (see --help)");
    final boolean fromStdin = output.equals("-");
    for (String name : new String[] {"--password", "--pin-key", "--master-key", "--challenge"}) {
      if (opt.containsKey(name) && opt.containsKey(name + "-file")) throw new Usage(name + " is given twice");
      if (opt.containsKey(name + "-file")) secrets.put(name, secretFile(opt.get(name + "-file"), in, fromStdin));
      else if (opt.containsKey(name)) secrets.put(name, opt.get(name).getBytes(StandardCharsets.UTF_8));
    }
    final int type = number(opt.getOrDefault("--type", "48"));
    final String modeText = opt.getOrDefault("--mode", "S");
    if (!modeText.equals("S") && !modeText.equals("F")) throw new Usage("--mode is S or F");
    final String text = trimmed(fromStdin ? readAtMost(in, TesselOpener.MAX_OUTPUT + 1) : Bytes.latin1(output));
    final byte[] password = secrets.get("--password");

    if (secrets.containsKey("--challenge")) {
      byte[] content = EncryptedPinCode.open(nonEmpty(secrets.get("--challenge"), "--challenge"), text);
      secrets.put("content", content);
      return report(out, password, content, content);
    }
    if (layoutOnly) {
      TesselOpener.Layout l = TesselOpener.layout(text);
      out.printf("key-blob-length: %d%nrsa-length: %d%ncontent-length: %d%ntotal-length: %d%n",
          l.keyBlobLength(), l.rsaLength(), l.contentLength(), l.totalLength());
      return 0;
    }
    final Types.Kind kind = Types.of(type);
    if (kind.outer() == Types.Outer.NONE) throw new Usage("encryption type " + type + " produces no output");
    final boolean needsEnc = kind.outer() == Types.Outer.DIRECT_ENC;
    if (!opt.containsKey(needsEnc ? "--enc-key" : "--key")) {
      throw new Usage("type " + type + " needs " + (needsEnc ? "--enc-key" : "--key") + " (see --help)");
    }
    TesselOpener.Builder keys = TesselOpener.builder();
    if (opt.containsKey("--key")) keys.appKey(key(opt.get("--key")));
    if (opt.containsKey("--enc-key")) keys.encKey(key(opt.get("--enc-key")));
    final boolean pinKey = secrets.containsKey("--pin-key");
    if (pinKey) {
      byte[] hex = secrets.get("--pin-key");
      byte[] pin = null;
      try {
        if (hex.length != 32) throw new Usage("--pin-key must be 32 hex digits");
        pin = Bytes.fromHex(hex, "--pin-key");
        keys.pinKey(pin);
      } catch (OpenException.BadEncoding e) {
        throw new Usage("--pin-key must be 32 hex digits");
      } finally {
        Bytes.wipe(pin);
      }
    } else if (secrets.containsKey("--master-key") || opt.containsKey("--wrapped-working-key")
        || opt.containsKey("--wrapped-pin-key")) {
      char[] master = Bytes.chars(secrets.getOrDefault("--master-key", new byte[0]));
      try {
        keys.pinKey(master, opt.get("--wrapped-working-key"), opt.get("--wrapped-pin-key"));
      } catch (OpenException.BadEncoding e) {
        throw new Usage(e.getMessage(), e);
      } finally {
        Bytes.wipe(master);
      }
    }
    final boolean derived = pinKey || secrets.containsKey("--master-key");
    final boolean sealed = kind.outer() == Types.Outer.WRAPPED_ENVELOPE && !kind.inner().text()
        && (!opt.containsKey("--enc-key") || (kind.inner() == Types.Inner.TYPE68 && !derived));
    if (password != null && sealed) throw new Usage("the payload is sealed: give --enc-key (and the PIN key for 68)");

    final TesselOpener.Options options = new TesselOpener.Options(opt.containsKey("--salt"), opt.get("--timestamp"));
    try (Opened opened = keys.build().open(type, text, options)) {
      if (opened.wrapped()) {
        byte[] payload = opened.payload();
        out.printf("strength: %c%ntimestamp: %s%npayload: ", opened.strength(), opened.timestamp());
        printable(out, payload);
        Bytes.wipe(payload);
      } else if (opened.timestamp() != null) {
        out.printf("timestamp: %s%n", opened.timestamp());
      }
      byte[] content = opened.content();
      secrets.put("content", content);
      if (password == null) {
        if (content != null) printContent(out, content);
        return 0;
      }
      if (!PasswordCheck.matches(opened, password, opt.getOrDefault("--salt", ""), modeText.charAt(0))) throw new OpenException.Rejected();
      return report(out, password, content, null);
    }
  }

  /** Prints the content, then the password verdict when one was asked for (the check is done). */
  private static int report(PrintStream out, byte[] password, byte[] content, byte[] compareWith)
      throws OpenException.Rejected {
    if (compareWith != null && password != null && (compareWith.length != password.length
        || Bytes.equalMask(compareWith, 0, password, 0, password.length) == 0)) {
      throw new OpenException.Rejected();
    }
    printContent(out, content);
    if (password != null) out.print("password: match\n");
    return 0;
  }

  private static void printContent(PrintStream out, byte[] content) {
    out.print("content: ");
    printable(out, content);
  }

  private static byte[] nonEmpty(byte[] value, String what) throws Usage {
    if (value.length == 0 || value[0] == 0) throw new Usage(what + " is empty");
    return value;
  }

  private static int number(String v) throws Usage {
    try {
      return Integer.parseInt(v);
    } catch (NumberFormatException e) {
      throw new Usage("--type needs a number", e);
    }
  }

  /** The output without trailing CR, LF and spaces; a plain loop, linear in the length. */
  static String trimmed(byte[] text) {
    int n = text.length;
    while (n > 0 && (text[n - 1] == '\n' || text[n - 1] == '\r' || text[n - 1] == ' ')) --n;
    return Bytes.text(text, 0, n);
  }

  private static PrivateKey key(String path) throws Usage {
    try {
      return PemKeys.read(Path.of(path));
    } catch (IOException e) {
      throw new Usage("cannot read " + path, e);
    } catch (GeneralSecurityException e) {
      throw new Usage(path + ": " + e.getMessage(), e);
    }
  }
}
