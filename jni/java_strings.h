/*
 * java_strings.h - Java strings and byte arrays for native code beside libOrvalis.so
 *
 * Each function takes the JNI environment of the calling thread. NULL comes back for a NULL
 * argument and when something fails; a Java exception that caused the failure is then left pending,
 * as JNI's own functions do. Local references, that of an encoding's name included, live until the
 * calling native method returns. Any thread that Java knows may call at any time.
 */
#ifndef ORVALIS_JAVA_STRINGS_H
#define ORVALIS_JAVA_STRINGS_H

#include <jni.h>

#ifdef __cplusplus
extern "C" {
#endif

/* The bytes of a C string, without its terminator. */
jbyteArray cstr2jbyteArray(JNIEnv *env, const char *text);

/* The bytes of an array up to its first zero as a C string, which the caller frees. */
char *jbyteArray2cstr(JNIEnv *env, jbyteArray bytes);

/* The bytes of a string in the platform's encoding, or in the named one. */
jbyteArray javaGetBytes(JNIEnv *env, jstring text);
jbyteArray javaGetBytesEncoding(JNIEnv *env, jstring text, const char *encoding);

/* The string whose bytes these are in the platform's encoding, or in the named one. */
jstring javaNewString(JNIEnv *env, jbyteArray bytes);
jstring javaNewStringEncoding(JNIEnv *env, jbyteArray bytes, const char *encoding);

#ifdef __cplusplus
}
#endif

#endif /* ORVALIS_JAVA_STRINGS_H */
