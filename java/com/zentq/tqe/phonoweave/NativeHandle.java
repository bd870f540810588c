package com.zentq.tqe.phonoweave;

import java.lang.ref.PhantomReference;
import java.lang.ref.Reference;
import java.lang.ref.ReferenceQueue;
import java.util.Collections;
import java.util.Iterator;
import java.util.Queue;
import java.util.Set;
import java.util.concurrent.ConcurrentHashMap;
import java.util.concurrent.ConcurrentLinkedQueue;
import java.util.concurrent.locks.ReentrantLock;

/**
 * One engine handle and the mark that it is in use. Every call on the owner enters first and leaves
 * at its end, so that nothing releases the handle during a call: neither a close, on this thread or
 * another, nor the release of handles whose owners were forgotten.
 *
 * <p>Forgotten handles are released when the next one is made, so no thread has to wait for them.
 */
final class NativeHandle extends PhantomReference<Object> {
  interface Release {
    void release(long address);
  }

  private static final ReferenceQueue<Object> FORGOTTEN = new ReferenceQueue<>();

  /** A reference that nobody holds would never be queued. */
  private static final Set<NativeHandle> LIVING =
      Collections.newSetFromMap(new ConcurrentHashMap<NativeHandle, Boolean>());

  /** Forgotten handles that are not released yet, because their last call was still running. */
  private static final Queue<NativeHandle> PUT_OFF = new ConcurrentLinkedQueue<>();

  private final ReentrantLock use = new ReentrantLock();
  private final Release release;
  private long address;

  /**
   * Takes charge of an address.
   *
   * @throws IllegalStateException if it is that of a failed creation
   */
  NativeHandle(Object owner, long address, Release release) {
    super(owner, FORGOTTEN);
    if (address == 0 || address == -1) {
      throw new IllegalStateException("the engine could not create an instance: out of memory");
    }
    this.address = address;
    this.release = release;
    LIVING.add(this);
  }

  /** Releases the handles whose owners were collected without having been closed, but for busy ones. */
  static void releaseForgotten() {
    for (Reference<?> found = FORGOTTEN.poll(); found != null; found = FORGOTTEN.poll()) {
      PUT_OFF.add((NativeHandle) found);
    }
    for (Iterator<NativeHandle> all = PUT_OFF.iterator(); all.hasNext(); ) {
      NativeHandle handle = all.next();
      if (handle.use.isHeldByCurrentThread() || !handle.use.tryLock()) continue;
      try {
        handle.release();
      } finally {
        handle.leave();
      }
      all.remove();
    }
  }

  /** Handles that are not released yet. */
  static int living() {
    return LIVING.size();
  }

  /**
   * Begins a call, once no other thread is in one. A log handler's call does not wait: its thread is
   * inside a call already, and two such threads could wait for each other for ever.
   *
   * @throws IllegalStateException in a log handler, if this handle is in use
   */
  void enter() {
    if (use.isHeldByCurrentThread()) {
      throw new IllegalStateException("called by a log handler from inside its own call");
    }
    if (!EngineLog.isHandling()) {
      use.lock();
    } else if (!use.tryLock()) {
      throw new IllegalStateException("in use by another thread, for which no log handler waits");
    }
  }

  /** Ends a call. */
  void leave() {
    use.unlock();
  }

  /** The address; to be called, and used, between enter and leave. */
  long address() {
    if (address == 0) throw new IllegalStateException("used after close");
    return address;
  }

  /**
   * Releases the address; does nothing if that has happened.
   *
   * @throws IllegalStateException in a log handler, if this handle is in use
   */
  void close() {
    enter();
    try {
      release();
    } finally {
      leave();
    }
  }

  private void release() {
    if (address == 0) return;
    release.release(address);
    address = 0;
    LIVING.remove(this);
    clear();
  }
}
