package com.qn.tessel.test;

import java.util.concurrent.Callable;
import java.util.concurrent.ExecutionException;
import java.util.concurrent.ExecutorService;
import java.util.concurrent.Executors;
import java.util.concurrent.Future;

/**
 * A GL renderer thread with its own offscreen OpenGL ES 1.1 context (Mesa surfaceless display,
 * pbuffer of the given size), standing in for the thread of an app's GLSurfaceView. Work is
 * queued onto the thread with {@link #call} / {@link #run}, like {@code queueEvent}; the pixels of
 * the last frame are read back with {@link #readRgba}. Native side: tests/jvm/native/egl_helper.cpp.
 */
final class EglContext implements AutoCloseable {
  private static native long nativeCreate(int width, int height);

  private static native String nativeLastError();

  private static native String nativeRenderer();

  private static native byte[] nativeReadPixels(long handle);

  private static native void nativeRelease(long handle);

  final int width;
  final int height;
  private final ExecutorService thread;
  private final long handle;
  private final String renderer;

  EglContext(int width, int height) throws Exception {
    this.width = width;
    this.height = height;
    this.thread = Executors.newSingleThreadExecutor(r -> {
      Thread t = new Thread(r, "gl-" + width + "x" + height);
      t.setDaemon(true);
      return t;
    });
    long h = 0;
    String error = null;
    String name = null;
    try {
      long[] made = new long[1];
      String[] text = new String[2];
      call(() -> {
        made[0] = nativeCreate(width, height);
        text[0] = made[0] == 0 ? nativeLastError() : null;
        text[1] = made[0] != 0 ? nativeRenderer() : null;
        return null;
      });
      h = made[0];
      error = text[0];
      name = text[1];
    } finally {
      if (h == 0) thread.shutdownNow();
    }
    if (h == 0) throw new IllegalStateException("no offscreen GLES 1.1 context: " + error);
    this.handle = h;
    this.renderer = name;
  }

  String renderer() {
    return renderer;
  }

  <T> T call(Callable<T> work) throws Exception {
    Future<T> f = thread.submit(work);
    try {
      return f.get();
    } catch (ExecutionException e) {
      Throwable cause = e.getCause();
      if (cause instanceof Exception) throw (Exception) cause;
      throw e;
    }
  }

  void run(Runnable work) throws Exception {
    call(() -> {
      work.run();
      return null;
    });
  }

  /** The pbuffer as RGBA bytes, top row first (the orientation of the app's touch coordinates). */
  byte[] readRgba() throws Exception {
    byte[] bottomUp = call(() -> nativeReadPixels(handle));
    if (bottomUp == null) throw new IllegalStateException("glReadPixels failed");
    byte[] topDown = new byte[bottomUp.length];
    int stride = width * 4;
    for (int row = 0; row < height; ++row) {
      System.arraycopy(bottomUp, row * stride, topDown, (height - 1 - row) * stride, stride);
    }
    return topDown;
  }

  @Override
  public void close() {
    try {
      run(() -> nativeRelease(handle));
    } catch (Exception e) {
      throw new IllegalStateException("releasing the GL context failed", e);
    } finally {
      thread.shutdown();
    }
  }
}
