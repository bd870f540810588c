// The string helpers when Java fails them, anywhere, over an environment of our own; and on first
// use by many threads. Elements of arrays are copies of exactly their number, so that sanitizers
// notice what is read beyond.
#include <gtest/gtest.h>

#include <algorithm>
#include <atomic>
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

enum Function {
  kNone,
  kFindClass,
  kNewGlobalRef,
  kGetMethodID,
  kNewStringUTF,
  kNewByteArray,
  kGetElements
};
constinit std::atomic<Function> failing = kNone;
constinit std::atomic<int> references = 0;
int copies = 0;       // of elements that were not given back
std::string content;  // of the one array

template <class Reference>
Reference unless(Function function, Reference given) {
  return failing == function ? nullptr : given;
}

_jclass type;
_jstring text;
_jbyteArray array;
int method;
jobject give_bytes(JNIEnv *, jobject, jmethodID, ...) { return &array; }
jobject give_text(JNIEnv *, jclass, jmethodID, ...) { return &text; }

JNINativeInterface_ make_functions() {
  JNINativeInterface_ functions = {};
  functions.FindClass = [](JNIEnv *, const char *name) {
    EXPECT_STREQ(name, "java/lang/String");
    return unless(kFindClass, &type);
  };
  functions.NewGlobalRef = [](JNIEnv *, jobject object) {
    ++references;
    return unless(kNewGlobalRef, object);
  };
  functions.GetMethodID = [](JNIEnv *, jclass, const char *, const char *) {
    return unless(kGetMethodID, reinterpret_cast<jmethodID>(&method));
  };
  functions.NewStringUTF = [](JNIEnv *, const char *) { return unless(kNewStringUTF, &text); };
  functions.CallObjectMethod = give_bytes;
  functions.NewObject = give_text;
  functions.NewByteArray = [](JNIEnv *, jsize length) -> jbyteArray {
    content.assign(static_cast<std::size_t>(length), '?');
    return unless(kNewByteArray, &array);
  };
  functions.SetByteArrayRegion = [](JNIEnv *, jbyteArray, jsize at, jsize count,
                                    const jbyte *from) { std::copy_n(from, count, &content[at]); };
  functions.GetArrayLength = [](JNIEnv *, jarray) { return static_cast<jsize>(content.size()); };
  functions.GetByteArrayElements = [](JNIEnv *, jbyteArray, jboolean *) -> jbyte * {
    if (failing == kGetElements) return nullptr;
    ++copies;
    auto *copy = static_cast<jbyte *>(std::malloc(content.size()));
    std::ranges::copy(content, copy);
    return copy;
  };
  functions.ReleaseByteArrayElements = [](JNIEnv *, jbyteArray, jbyte *copy, jint mode) {
    EXPECT_EQ(mode, JNI_ABORT) << "what was only read is not written back";
    --copies;
    std::free(copy);
  };
  return functions;
}

const JNINativeInterface_ functions = make_functions();
JNIEnv environment = {&functions};

jobject get() { return javaGetBytes(&environment, &text); }
jobject get_named() { return javaGetBytesEncoding(&environment, &text, "UTF-8"); }
jobject make() { return javaNewString(&environment, &array); }
jobject make_named() { return javaNewStringEncoding(&environment, &array, "UTF-8"); }

/// Calls a helper, which has to return `result` and to log these errors.
void expect(jobject (*helper)(), jobject result, const std::string &errors) {
  std::string lines;
  SetLogSink(
      [](int priority, const char *tag, const char *line, void *user) {
        if (priority == 6 && std::string(tag) == "Orvalis")
          *static_cast<std::string *>(user) += std::string(line) + ";";
      },
      &lines);
  EXPECT_EQ(helper(), result) << failing;
  EXPECT_EQ(lines, errors) << failing;
  SetLogSink(nullptr, nullptr);
}

TEST(StringHelpers, TellWhatFailedAndTryAgain) {
  const std::string got = "Insert javaGetBytes;", made = "Insert javaNewString;";
  const struct {
    Function failing;
    std::string get, make;
  } kFailures[] = {{kFindClass, "cls.error;", "cls.error;"},
                   {kNewGlobalRef, "class_String.error;", "class_String.error;"},
                   {kGetMethodID, "mid_getBytes.error;", "mid_newString.error;"}};
  for (const auto &failure : kFailures) {
    failing = failure.failing;
    expect(get, nullptr, got + failure.get);
    expect(get_named, nullptr, got + failure.get);
    expect(make, nullptr, made + failure.make);
    expect(make_named, nullptr, failure.make);
  }
  failing = kNewStringUTF;
  expect(get_named, nullptr, got);
  expect(make_named, nullptr, "");
  failing = kNone;
  const int before = references;  // the class was kept from the time when only methods failed
  for (int round = 0; round < 2; ++round) {
    expect(get, &array, got);
    expect(get_named, &array, got);
    expect(make, &text, made);
    expect(make_named, &text, "");
  }
  EXPECT_EQ(references, before);
}

TEST(StringHelpers, CopyUpToTheFirstZero) {
  using Text = std::unique_ptr<char, void (*)(void *)>;
  for (const auto function : {kNone, kNewByteArray, kGetElements}) {
    failing = function;
    for (const auto &given : {std::string(), std::string("pcm"), std::string("p\0cm", 4),
                              std::string(1, '\0'), std::string(99999, '\xff')}) {
      content = given;
      const Text made(jbyteArray2cstr(&environment, &array), std::free);
      EXPECT_EQ(made == nullptr, failing == kGetElements);
      EXPECT_STREQ(made ? made.get() : given.c_str(), given.c_str());
      EXPECT_EQ(copies, 0);
      EXPECT_EQ(cstr2jbyteArray(&environment, given.c_str()), unless(kNewByteArray, &array));
      EXPECT_TRUE(failing == kNewByteArray || content == given.c_str());
    }
  }
  failing = kNone;
}

TEST(StringHelpers, FirstUseMayBeRaced) {
  constexpr int kThreads = 16;
  SetLogSink(LogNothing, nullptr);
  std::latch start(kThreads);
  std::atomic<int> right = 0;
  std::vector<std::thread> threads;
  for (int i = 0; i < kThreads; ++i)
    threads.emplace_back([&] {
      start.arrive_and_wait();
      right += (get() == &array) + (make() == &text);
    });
  for (std::thread &thread : threads) thread.join();
  EXPECT_EQ(right, 2 * kThreads);
  SetLogSink(nullptr, nullptr);
}

}  // namespace
}  // namespace orvalis::test
