package com.qn.tessel.test;

import com.qn.tessel.server.Cli;
import java.io.ByteArrayInputStream;
import java.io.ByteArrayOutputStream;
import java.io.PrintStream;
import java.nio.charset.StandardCharsets;
import java.util.ArrayList;
import java.util.Arrays;
import java.util.List;
import java.util.Map;
import java.util.TreeMap;
import java.util.concurrent.TimeUnit;

/**
 * The bank's two openers side by side: tessel_open (C++ on OpenSSL, run as a process) and the
 * command line of tessel-server.jar (JDK providers, run in this JVM). Both get the same options
 * and the output on stdin; their exit codes and "field: value" lines must agree.
 */
final class Openers {
  static String cppTool;
  static String appKeyPem;
  static String encKeyPem;

  private Openers() {}

  record Result(int exit, Map<String, String> fields, String stderr) {
    String get(String field) {
      return fields.get(field);
    }
  }

  private static Result parse(int exit, String stdout, String stderr) {
    Map<String, String> fields = new TreeMap<>();
    for (String line : stdout.split("\n")) {
      int colon = line.indexOf(": ");
      if (colon > 0) fields.put(line.substring(0, colon), line.substring(colon + 2));
    }
    return new Result(exit, fields, stderr.trim());
  }

  static Result cpp(List<String> args, String output) throws Exception {
    List<String> cmd = new ArrayList<>(List.of(cppTool));
    cmd.addAll(args);
    Process p = new ProcessBuilder(cmd).start();
    p.getOutputStream().write(output.getBytes(StandardCharsets.ISO_8859_1));
    p.getOutputStream().close();
    String stdout = new String(p.getInputStream().readAllBytes(), StandardCharsets.UTF_8);
    String stderr = new String(p.getErrorStream().readAllBytes(), StandardCharsets.UTF_8);
    if (!p.waitFor(60, TimeUnit.SECONDS)) throw new IllegalStateException("tessel_open did not finish");
    return parse(p.exitValue(), stdout, stderr);
  }

  static Result java(List<String> args, String output) {
    ByteArrayOutputStream out = new ByteArrayOutputStream();
    ByteArrayOutputStream err = new ByteArrayOutputStream();
    int exit = Cli.run(args.toArray(new String[0]), new ByteArrayInputStream(output.getBytes(StandardCharsets.ISO_8859_1)),
        new PrintStream(out, true, StandardCharsets.UTF_8), new PrintStream(err, true, StandardCharsets.UTF_8));
    return parse(exit, out.toString(StandardCharsets.UTF_8), err.toString(StandardCharsets.UTF_8));
  }

  /** Both openers on the output of `type` (stdin, never a command line); returns the agreed result. */
  static Result open(int type, String output, boolean withEncKey, String... options) throws Exception {
    List<String> args = new ArrayList<>(List.of("--type", Integer.toString(type), "--key", appKeyPem));
    if (withEncKey) args.addAll(List.of("--enc-key", encKeyPem));
    args.addAll(Arrays.asList(options));
    args.add("-");
    Result c = cpp(args, output);
    Result j = java(args, output);
    Check.equal(c.exit(), j.exit(), "exit codes, type " + type + ": " + c.stderr() + " / " + j.stderr());
    Check.equal(c.fields(), j.fields(), "fields, type " + type);
    return c;
  }
}
