package com.qn.tessel.server;

/**
 * One opened output. A field the output does not carry is {@code null}, the one way this class
 * says "absent".
 *
 * <p>The payload and the content are secrets (for type 48 without a salt both are the password):
 * they are kept as bytes, each accessor returns a fresh copy for the caller to wipe, and
 * {@link #close()} wipes this object's own copies. Use it in try-with-resources.
 */
public final class Opened implements AutoCloseable {
  private final int type;
  private final Character strength;
  private final String timestamp;
  private final byte[] payload;
  private final byte[] content;

  /** Takes ownership of payload and content (not copied). */
  Opened(int type, Character strength, String timestamp, byte[] payload, byte[] content) {
    this.type = type;
    this.strength = strength;
    this.timestamp = timestamp;
    this.payload = payload;
    this.content = content;
  }

  /** @return the encryption type it was opened as */
  public int type() {
    return type;
  }

  /** @return whether it carried a wrapper: then strength, timestamp and payload are set */
  public boolean wrapped() {
    return strength != null;
  }

  /** @return the strength letter ('E', 'W', 'M', 'S'), or null without a wrapper */
  public Character strength() {
    return strength;
  }

  /** @return the timestamp of the wrapper or of a length-prefixed pair, or null */
  public String timestamp() {
    return timestamp;
  }

  /** @return a copy of the payload as found in the wrapper (RSA types: still sealed), or null */
  public byte[] payload() {
    return payload == null ? null : payload.clone();
  }

  /**
   * @return a copy of the content: the text, PIN digits, salted value or SHA-1 hex (type 5); null
   *     when it stays sealed (no encryption-platform key, or type 68 without a PIN key)
   */
  public byte[] content() {
    return content == null ? null : content.clone();
  }

  /** @return the content as characters (bytes 1:1, the keyboard types single-byte text), or null */
  public char[] contentChars() {
    return content == null ? null : Bytes.chars(content);
  }

  /** @return whether {@link #content()} was opened */
  public boolean contentOpened() {
    return content != null;
  }

  /** Compares the content with {@code expected} in time independent of where they differ. */
  boolean contentEquals(byte[] expected) {
    return content != null && content.length == expected.length
        && Bytes.equalMask(content, 0, expected, 0, expected.length) != 0;
  }

  /** Wipes this object's copies of the payload and the content. */
  @Override
  public void close() {
    Bytes.wipe(payload, content);
  }

  /** Shows the fields but never the content or payload, so logging a result leaks nothing. */
  @Override
  public String toString() {
    return "Opened[type=" + type + ", strength=" + (strength == null ? "-" : strength) + ", timestamp=" + timestamp
        + ", content=" + (content == null ? "sealed" : content.length + " bytes") + "]";
  }
}
