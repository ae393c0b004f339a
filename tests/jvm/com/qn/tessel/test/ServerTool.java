package com.qn.tessel.test;

import java.nio.charset.StandardCharsets;
import java.util.ArrayList;
import java.util.HashMap;
import java.util.List;
import java.util.Map;
import java.util.concurrent.TimeUnit;

/**
 * The bank's side: runs the envelope opener (tools/server, tessel_open) on an output of the
 * library, with the private key of the built-in default modulus and optionally the key of the
 * encryption platform, and parses its "field: value" lines.
 */
final class ServerTool {
  final String executable;
  final String appKeyPem;

  ServerTool(String executable, String appKeyPem) {
    this.executable = executable;
    this.appKeyPem = appKeyPem;
  }

  static final class Result {
    int exitCode;
    final Map<String, String> fields = new HashMap<>();
    String stderr = "";

    String get(String field) {
      return fields.get(field);
    }

    @Override
    public String toString() {
      return "exit " + exitCode + " " + fields + " " + stderr.trim();
    }
  }

  Result open(int type, String output, String encKeyPem) throws Exception {
    List<String> cmd = new ArrayList<>();
    cmd.add(executable);
    cmd.add("--type");
    cmd.add(Integer.toString(type));
    cmd.add("--key");
    cmd.add(appKeyPem);
    if (encKeyPem != null) {
      cmd.add("--enc-key");
      cmd.add(encKeyPem);
    }
    cmd.add("-");  // the output goes through stdin, never onto a command line
    Process p = new ProcessBuilder(cmd).start();
    p.getOutputStream().write(output.getBytes(StandardCharsets.ISO_8859_1));
    p.getOutputStream().close();
    Result r = new Result();
    String stdout = new String(p.getInputStream().readAllBytes(), StandardCharsets.UTF_8);
    r.stderr = new String(p.getErrorStream().readAllBytes(), StandardCharsets.UTF_8);
    if (!p.waitFor(60, TimeUnit.SECONDS)) {
      p.destroyForcibly();
      throw new IllegalStateException("tessel_open did not finish");
    }
    r.exitCode = p.exitValue();
    for (String line : stdout.split("\n")) {
      int colon = line.indexOf(": ");
      if (colon > 0) r.fields.put(line.substring(0, colon), line.substring(colon + 2));
    }
    return r;
  }
}
