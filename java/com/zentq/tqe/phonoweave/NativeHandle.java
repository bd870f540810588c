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
 * A handle of the library, and whether it is in use. Every call on its owner enters first and
 * leaves last, so that nothing releases the handle during a call: neither close, on this thread or
 * another, nor the release of forgotten handles, whose owners were collected without being closed.
 *
 * <p>Forgotten handles are released when the next one is created, so no thread has to wait for
 * them.
 */
final class NativeHandle extends PhantomReference<Object> {
  interface Release {
    void release(long address);
  }

  private static final ReferenceQueue<Object> FORGOTTEN = new ReferenceQueue<>();

  /** A reference that nobody holds would never be queued. */
  private static final Set<NativeHandle> LIVING =
      Collections.newSetFromMap(new ConcurrentHashMap<NativeHandle, Boolean>());

  /** Forgotten handles that are still to be released: their last call may be running. */
  private static final Queue<NativeHandle> PUT_OFF = new ConcurrentLinkedQueue<>();

  private final ReentrantLock use = new ReentrantLock();
  private final Release release;
  private long address;

  /**
   * Takes over an address, which is passed to release at the end.
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

  /** Releases the handles whose owners were collected without being closed; those in use wait. */
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
   * Begins a call once no other thread is in one. In a log handler it does not wait: the thread is
   * in a call already, and two such threads could wait for each other forever.
   *
   * @throws IllegalStateException in a log handler, if this handle is in use
   */
  void enter() {
    if (use.isHeldByCurrentThread()) {
      throw new IllegalStateException("called by a log handler during its own call");
    }
    if (!EngineLog.isHandling()) {
      use.lock();
    } else if (!use.tryLock()) {
      throw new IllegalStateException("in use by another thread; log handlers do not wait");
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
