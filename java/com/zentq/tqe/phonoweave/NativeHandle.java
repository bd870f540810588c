package com.zentq.tqe.phonoweave;

import java.lang.ref.PhantomReference;
import java.lang.ref.Reference;
import java.lang.ref.ReferenceQueue;
import java.util.Collections;
import java.util.Set;
import java.util.concurrent.ConcurrentHashMap;

/**
 * One engine handle and its owner's lock. Whoever uses the address holds the lock meanwhile, so that
 * nothing releases it under a running call: neither another thread's close, nor the release of a
 * handle whose owner was forgotten.
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

  /** Releases the handles whose owners were collected without having been closed. */
  static void releaseForgotten() {
    for (Reference<?> found = FORGOTTEN.poll(); found != null; found = FORGOTTEN.poll()) {
      ((NativeHandle) found).close();
    }
  }

  /** Handles that are not released yet. */
  static int living() {
    return LIVING.size();
  }

  /** The address; to be called, and used, with this handle's lock held. */
  long address() {
    if (address == 0) throw new IllegalStateException("used after close");
    return address;
  }

  /** Releases the address; does nothing if that has happened. */
  synchronized void close() {
    if (address == 0) return;
    release.release(address);
    address = 0;
    LIVING.remove(this);
    clear();
  }
}
