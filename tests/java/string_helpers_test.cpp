// The string helpers when Java fails them, anywhere, over an environment of our own; and on first
// use by many threads. Elements of arrays are copies of exactly their number, so that sanitizers
// notice what is read beyond.
#include <gtest/gtest.h>

#include <algorithm>
#include <atomic>
#include <cstdarg>
#include <cstdlib>
#include <latch>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include "jni/java_strings.h"
#include "jni/orvalis.h"

namespace orvalis::test {
namespace {

constinit std::atomic<const char *> failing = "";  // name of the function that fails
constinit std::atomic<int> references = 0;
int copies = 0;                   // of elements that were not given back
std::string content;              // of the one array
thread_local std::string called;  // the numbers of the methods

bool fails(const char *function) { return std::string(failing.load()) == function; }

_jclass type;
_jstring text, encoding;
_jbyteArray array;
constexpr const char *kMethods[] = {"getBytes()[B", "getBytes(Ljava/lang/String;)[B", "<init>([B)V",
                                    "<init>([BLjava/lang/String;)V"};

/// Notes the call. Whether the method takes an encoding.
bool is_named(jmethodID id) {
  const auto number = reinterpret_cast<std::intptr_t>(id) - 1;
  called += std::to_string(number);
  return number % 2 == 1;
}

jobject give_bytes(JNIEnv *, jobject given, jmethodID id, ...) {
  va_list rest;
  va_start(rest, id);
  EXPECT_EQ(given, &text);
  EXPECT_TRUE(!is_named(id) || va_arg(rest, jobject) == &encoding);
  va_end(rest);
  return &array;
}

jobject give_text(JNIEnv *, jclass given, jmethodID id, ...) {
  va_list rest;
  va_start(rest, id);
  EXPECT_EQ(given, &type);
  EXPECT_EQ(va_arg(rest, jobject), &array);
  EXPECT_TRUE(!is_named(id) || va_arg(rest, jobject) == &encoding);
  va_end(rest);
  return &text;
}

JNINativeInterface_ make_functions() {
  JNINativeInterface_ java = {};
  java.FindClass = [](JNIEnv *, const char *name) {
    EXPECT_STREQ(name, "java/lang/String");
    return fails("FindClass") ? nullptr : &type;
  };
  java.NewGlobalRef = [](JNIEnv *, jobject object) {
    ++references;
    return fails("NewGlobalRef") ? nullptr : object;
  };
  java.GetMethodID = [](JNIEnv *, jclass, const char *name, const char *signature) {
    const auto found = std::ranges::find(kMethods, std::string(name) + signature);
    return fails("GetMethodID") ? nullptr : reinterpret_cast<jmethodID>(found - kMethods + 1);
  };
  java.NewStringUTF = [](JNIEnv *, const char *name) {
    EXPECT_STREQ(name, "UTF-8");
    return fails("NewStringUTF") ? nullptr : &encoding;
  };
  java.CallObjectMethod = give_bytes;
  java.NewObject = give_text;
  java.NewByteArray = [](JNIEnv *, jsize length) -> jbyteArray {
    content.assign(static_cast<std::size_t>(length), '?');
    return fails("NewByteArray") ? nullptr : &array;
  };
  java.SetByteArrayRegion = [](JNIEnv *, jbyteArray, jsize at, jsize count, const jbyte *from) {
    std::copy_n(from, count, &content[at]);
  };
  java.GetArrayLength = [](JNIEnv *, jarray) { return static_cast<jsize>(content.size()); };
  java.GetByteArrayElements = [](JNIEnv *, jbyteArray, jboolean *) -> jbyte * {
    if (fails("GetByteArrayElements")) return nullptr;
    ++copies;
    auto *copy = static_cast<jbyte *>(std::malloc(content.size()));
    std::ranges::copy(content, copy);
    return copy;
  };
  java.ReleaseByteArrayElements = [](JNIEnv *, jbyteArray, jbyte *copy, jint mode) {
    EXPECT_EQ(mode, JNI_ABORT) << "what was only read is not written back";
    --copies;
    std::free(copy);
  };
  return java;
}

const JNINativeInterface_ functions = make_functions();
JNIEnv env = {&functions};

/// Calls all helpers that reach methods of String; those without an encoding have to succeed or
/// not, so have those with one, and to log these errors.
void expect(bool plain, bool named, const std::string &errors) {
  std::string lines;
  called.clear();
  SetLogSink(
      [](int priority, const char *tag, const char *line, void *user) {
        if (priority == 6 && std::string(tag) == "Orvalis")
          *static_cast<std::string *>(user) += std::string(line) + ";";
      },
      &lines);
  EXPECT_EQ(javaGetBytes(&env, &text), plain ? &array : nullptr) << failing;
  EXPECT_EQ(javaGetBytesEncoding(&env, &text, "UTF-8"), named ? &array : nullptr) << failing;
  EXPECT_EQ(javaNewString(&env, &array), plain ? &text : nullptr) << failing;
  EXPECT_EQ(javaNewStringEncoding(&env, &array, "UTF-8"), named ? &text : nullptr) << failing;
  EXPECT_EQ(called, named ? "0123" : plain ? "02" : "") << failing;
  EXPECT_EQ(lines, errors) << failing;
  SetLogSink(nullptr, nullptr);
}

TEST(StringHelpers, TellWhatFailedAndTryAgain) {
  const std::string get = "Insert javaGetBytes;", make = "Insert javaNewString;";
  const std::string no_get = "mid_getBytes.error;", no_make = "mid_newString.error;";
  for (const auto &[function, error] : {std::pair("FindClass", std::string("cls.error;")),
                                        {"NewGlobalRef", "class_String.error;"}}) {
    failing = function;
    expect(false, false, get + error + get + error + make + error + error);
  }
  failing = "GetMethodID";
  expect(false, false, get + no_get + get + no_get + make + no_make + no_make);
  failing = "NewStringUTF";
  expect(true, false, get + get + make);
  failing = "";
  const int before = references;  // the class was kept from the time when only methods failed
  for (int round = 0; round < 2; ++round) expect(true, true, get + get + make);
  EXPECT_EQ(references, before);
}

TEST(StringHelpers, CopyUpToTheFirstZero) {
  for (const char *function : {"", "NewByteArray", "GetByteArrayElements"}) {
    failing = function;
    for (const auto &given : {std::string(), std::string("p\0cm", 4), std::string(1, '\0'),
                              std::string(9999, '\xff')}) {
      content = given;
      const std::unique_ptr<char, void (*)(void *)> made(jbyteArray2cstr(&env, &array), std::free);
      EXPECT_EQ(made == nullptr, fails("GetByteArrayElements"));
      EXPECT_STREQ(made ? made.get() : given.c_str(), given.c_str());
      EXPECT_EQ(copies, 0);
      EXPECT_EQ(cstr2jbyteArray(&env, given.c_str()) == nullptr, fails("NewByteArray"));
      EXPECT_TRUE(fails("NewByteArray") || content == given.c_str());
    }
  }
}

TEST(StringHelpers, ReturnNullForNull) {
  SetLogSink(LogNothing, nullptr);
  for (const void *result : std::initializer_list<const void *>{
           cstr2jbyteArray(&env, nullptr), jbyteArray2cstr(&env, nullptr),
           javaGetBytes(&env, nullptr), javaGetBytesEncoding(&env, nullptr, "UTF-8"),
           javaGetBytesEncoding(&env, &text, nullptr), javaNewString(&env, nullptr),
           javaNewStringEncoding(&env, nullptr, "UTF-8"),
           javaNewStringEncoding(&env, &array, nullptr)})
    EXPECT_EQ(result, nullptr);
  SetLogSink(nullptr, nullptr);
}

TEST(StringHelpers, FirstUseMayBeRaced) {
  SetLogSink(LogNothing, nullptr);
  std::latch start(16);
  std::atomic<int> right = 0;
  std::vector<std::thread> threads;
  for (int i = 0; i < 16; ++i)
    threads.emplace_back([&] {
      start.arrive_and_wait();
      right += (javaGetBytes(&env, &text) == &array) + (javaNewString(&env, &array) == &text);
    });
  for (std::thread &thread : threads) thread.join();
  EXPECT_EQ(right, 32);
  SetLogSink(nullptr, nullptr);
}

}  // namespace
}  // namespace orvalis::test
