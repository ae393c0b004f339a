/**
 * The bank's side of the keyboard library: opens its digital envelopes, the RSA payloads inside
 * them, the encrypted PIN code, and checks salted values against stored passwords. JDK providers
 * only (RSA, ARCFOUR, DESede, MD5, SHA-1); every class is immutable or stateless and thread-safe.
 * {@link com.qn.tessel.server.TesselOpener} is the entry point; {@link com.qn.tessel.server.Cli}
 * is the command line behind {@code java -jar tessel-server.jar}.
 */
package com.qn.tessel.server;
