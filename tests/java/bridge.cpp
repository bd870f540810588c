// The string helpers as native code calls them: natives of StringHelpersTest. The names of
// encodings take the way of the helpers too.
#include <jni.h>

#include <cstdlib>
#include <memory>

#include "jni/java_strings.h"

#define NATIVE(result, name) \
  extern "C" JNIEXPORT result JNICALL Java_com_zentq_tqe_phonoweave_StringHelpersTest_##name

namespace {

using Text = std::unique_ptr<char, void (*)(void *)>;
Text text_of(JNIEnv *env, jbyteArray bytes) { return {jbyteArray2cstr(env, bytes), std::free}; }

}  // namespace

NATIVE(jbyteArray, throughC)(JNIEnv *env, jclass, jbyteArray bytes) {
  return cstr2jbyteArray(env, text_of(env, bytes).get());
}

NATIVE(jbyteArray, encode)(JNIEnv *env, jclass, jstring text) { return javaGetBytes(env, text); }

NATIVE(jbyteArray, encodeAs)(JNIEnv *env, jclass, jstring text, jbyteArray encoding) {
  return javaGetBytesEncoding(env, text, text_of(env, encoding).get());
}

NATIVE(jstring, decode)(JNIEnv *env, jclass, jbyteArray bytes) { return javaNewString(env, bytes); }

NATIVE(jstring, decodeAs)(JNIEnv *env, jclass, jbyteArray bytes, jbyteArray encoding) {
  return javaNewStringEncoding(env, bytes, text_of(env, encoding).get());
}
