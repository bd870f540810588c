// The string helpers over an environment of our own: any bytes and lengths, and Java failing
// anywhere.
#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <string>

#include "fuzz/input.h"
#include "jni/java_strings.h"
#include "jni/orvalis.h"

namespace {

using orvalis::fuzz::Input;
using orvalis::fuzz::require;

/// A byte array of Java's. Elements are handed out as a copy of exactly their number, so that
/// reading beyond them is noticed.
struct Bytes : _jbyteArray {
  std::string content;
  int copies = 0;
};

Bytes array;
_jstring text;
_jclass type;
int method;
unsigned failures;  // bit by bit, which of the functions fail

bool fails(unsigned function) { return (failures >> function & 1) != 0; }

Bytes &bytes_of(jarray given) {
  require(given == &array, "only the caller's array is used");
  return array;
}

jobject call(JNIEnv *, jobject, jmethodID, ...) { return &array; }
jobject construct(JNIEnv *, jclass, jmethodID, ...) { return &text; }

JNINativeInterface_ make_functions() {
  JNINativeInterface_ functions = {};
  functions.FindClass = [](JNIEnv *, const char *) { return fails(0) ? nullptr : &type; };
  functions.NewGlobalRef = [](JNIEnv *, jobject object) { return fails(1) ? nullptr : object; };
  functions.GetMethodID = [](JNIEnv *, jclass, const char *, const char *) {
    return fails(2) ? nullptr : reinterpret_cast<jmethodID>(&method);
  };
  functions.NewStringUTF = [](JNIEnv *, const char *) { return fails(3) ? nullptr : &text; };
  functions.CallObjectMethod = call;
  functions.NewObject = construct;
  functions.NewByteArray = [](JNIEnv *, jsize length) -> jbyteArray {
    array.content.assign(static_cast<std::size_t>(length), '?');
    return fails(4) ? nullptr : &array;
  };
  functions.SetByteArrayRegion = [](JNIEnv *, jbyteArray to, jsize at, jsize count,
                                    const jbyte *from) {
    std::string &content = bytes_of(to).content;
    require(at == 0 && count == static_cast<jsize>(content.size()), "the whole array is filled");
    std::copy_n(from, count, content.begin());
  };
  functions.GetArrayLength = [](JNIEnv *, jarray from) {
    return static_cast<jsize>(bytes_of(from).content.size());
  };
  functions.GetByteArrayElements = [](JNIEnv *, jbyteArray from, jboolean *) -> jbyte * {
    if (fails(5)) return nullptr;
    const std::string &content = bytes_of(from).content;
    ++array.copies;
    auto *copy = new jbyte[content.size()];
    std::copy(content.begin(), content.end(), copy);
    return copy;
  };
  functions.ReleaseByteArrayElements = [](JNIEnv *, jbyteArray from, jbyte *copy, jint mode) {
    require(mode == JNI_ABORT, "what was only read is not written back");
    --bytes_of(from).copies;
    delete[] copy;
  };
  return functions;
}

void check_to_java(JNIEnv *env, const std::string &given) {
  const jbyteArray made = cstr2jbyteArray(env, given.c_str());
  require((made == nullptr) == fails(4), "an array, unless there is no memory for one");
  if (made != nullptr)
    require(array.content == given.c_str(), "the array holds the text up to its end");
}

void check_from_java(JNIEnv *env, const std::string &given) {
  array.content = given;
  const std::unique_ptr<char, void (*)(void *)> made(jbyteArray2cstr(env, &array), std::free);
  require((made == nullptr) == fails(5), "a text, unless Java hands out no elements");
  if (made != nullptr)
    require(std::string(made.get()) == given.c_str(), "the text goes up to the first zero");
  require(array.copies == 0, "elements are given back");
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t *bytes, std::size_t size) {
  static const JNINativeInterface_ functions = make_functions();
  JNIEnv env = {&functions};
  SetLogSink([](int, const char *, const char *, void *) {}, nullptr);
  Input input(bytes, size);
  while (!input.is_empty()) {
    const std::uint8_t choice = input.byte();
    failures = input.byte();
    std::string given(input.byte(), '\0');
    std::ranges::generate(given, [&] { return static_cast<char>(input.byte()); });
    const char *encoding = (choice & 8) != 0 ? nullptr : given.c_str();
    switch (choice % 4) {
      case 0:
        check_to_java(&env, given);
        break;
      case 1:
        check_from_java(&env, given);
        break;
      case 2: {
        const jbyteArray found = encoding == nullptr ? javaGetBytes(&env, &text)
                                                     : javaGetBytesEncoding(&env, &text, encoding);
        require(found == nullptr || found == &array, "bytes or none");
        break;
      }
      default: {
        const jstring made = encoding == nullptr ? javaNewString(&env, &array)
                                                 : javaNewStringEncoding(&env, &array, encoding);
        require(made == nullptr || made == &text, "a string or none");
      }
    }
  }
  return 0;
}
