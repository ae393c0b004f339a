package com.qn.tessel.server;

/**
 * One opened output.
 *
 * @param type the encryption type it was opened as
 * @param wrapped whether it carried a wrapper: then {@code strength}, {@code timestamp} and
 *     {@code payload} are set
 * @param strength the strength letter ('E', 'W', 'M', 'S'), or 0 without a wrapper
 * @param timestamp the timestamp of the wrapper or of a length-prefixed pair, else empty
 * @param payload the payload as found in the wrapper (RSA types: still sealed), else empty
 * @param content the text, PIN digits, salted value or SHA-1 hex (type 5); null when it stays
 *     sealed (no encryption-platform key given, or type 68 without a PIN key)
 */
public record Opened(int type, boolean wrapped, char strength, String timestamp, String payload, String content) {
  /** @return whether {@link #content()} was opened */
  public boolean contentOpened() {
    return content != null;
  }

  /** Shows the fields but never the content or payload, so logging a result leaks nothing. */
  @Override
  public String toString() {
    return "Opened[type=" + type + ", strength=" + (strength == 0 ? "-" : String.valueOf(strength))
        + ", timestamp=" + timestamp + ", content=" + (content == null ? "sealed" : content.length() + " chars") + "]";
  }
}
