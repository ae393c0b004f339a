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

  private static native byte[] nativeReadPixels(long handle);

  private static native void nativeRelease(long handle);

  final int width;
  final int height;
  private final ExecutorService thread;
  private final long handle;

  EglContext(int width, int height) throws Exception {
    this.width = width;
    this.height = height;
    this.thread = Executors.newSingleThreadExecutor(r -> {
      Thread t = new Thread(r, "gl-" + width + "x" + height);
      t.setDaemon(true);
      return t;
    });
    final long made = call(() -> nativeCreate(width, height));
    if (made == 0) {
      final String reason = call(EglContext::nativeLastError);
      thread.shutdownNow();
      throw new IllegalStateException("no offscreen GLES 1.1 context: " + reason);
    }
    this.handle = made;
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
    call(Executors.callable(work));
  }

  /** The pbuffer as RGBA bytes, top row first (the orientation of the app's touch coordinates). */
  byte[] readRgba() throws Exception {
    byte[] rgba = call(() -> nativeReadPixels(handle));
    if (rgba == null) throw new IllegalStateException("glReadPixels failed");
    return rgba;
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
