// What the string helpers do when Java fails them, through an environment whose functions fail on
// request, and on first use by many threads.
#include <gtest/gtest.h>

#include <atomic>
#include <latch>
#include <string>
#include <thread>
#include <vector>

#include "jni/java_strings.h"
#include "jni/orvalis.h"

namespace orvalis::test {
namespace {

constinit std::atomic<const char *> failing = "";  // name of the function that fails
constinit std::atomic<int> references = 0;

bool fails(const char *function) { return std::string(failing.load()) == function; }

// Objects are known by their addresses alone.
_jobject string_type, text, bytes;
int method;

template <class Reference>
Reference reference(_jobject &object) {
  return static_cast<Reference>(&object);
}

jobject give_bytes(JNIEnv *, jobject, jmethodID, ...) { return &bytes; }
jobject give_text(JNIEnv *, jclass, jmethodID, ...) { return &text; }

JNINativeInterface_ make_functions() {
  JNINativeInterface_ functions = {};
  functions.FindClass = [](JNIEnv *, const char *name) -> jclass {
    EXPECT_STREQ(name, "java/lang/String");
    return fails("FindClass") ? nullptr : reference<jclass>(string_type);
  };
  functions.NewGlobalRef = [](JNIEnv *, jobject object) -> jobject {
    ++references;
    return fails("NewGlobalRef") ? nullptr : object;
  };
  functions.GetMethodID = [](JNIEnv *, jclass, const char *, const char *) {
    return fails("GetMethodID") ? nullptr : reinterpret_cast<jmethodID>(&method);
  };
  functions.NewStringUTF = [](JNIEnv *, const char *) {
    return fails("NewStringUTF") ? nullptr : reference<jstring>(text);
  };
  functions.CallObjectMethod = give_bytes;
  functions.NewObject = give_text;
  functions.NewByteArray = [](JNIEnv *, jsize) -> jbyteArray { return nullptr; };
  functions.GetArrayLength = [](JNIEnv *, jarray) -> jsize { return 4; };
  functions.GetByteArrayElements = [](JNIEnv *, jbyteArray, jboolean *) -> jbyte * {
    return nullptr;
  };
  return functions;
}

const JNINativeInterface_ functions = make_functions();
JNIEnv environment = {&functions};

/// The error lines of one call of a helper, which has to return `result`.
template <class Helper>
std::string lines_of(Helper helper, const void *result) {
  std::string lines;
  SetLogSink(
      [](int priority, const char *tag, const char *line, void *user) {
        if (priority == 6 && std::string(tag) == "Orvalis")
          *static_cast<std::string *>(user) += std::string(line) + "; ";
      },
      &lines);
  EXPECT_EQ(helper(), result);
  SetLogSink(nullptr, nullptr);
  return lines;
}

TEST(StringHelpers, TellWhatFailedAndTryAgain) {
  const auto get = [] { return javaGetBytes(&environment, reference<jstring>(text)); };
  const auto get_named = [] {
    return javaGetBytesEncoding(&environment, reference<jstring>(text), "UTF-8");
  };
  const auto make = [] { return javaNewString(&environment, reference<jbyteArray>(bytes)); };
  const auto make_named = [] {
    return javaNewStringEncoding(&environment, reference<jbyteArray>(bytes), "UTF-8");
  };
  const struct {
    const char *failing, *get, *make;
  } kFailures[] = {{"FindClass", "cls.error; ", "cls.error; "},
                   {"NewGlobalRef", "class_String.error; ", "class_String.error; "},
                   {"GetMethodID", "mid_getBytes.error; ", "mid_newString.error; "}};
  const std::string get_line = "Insert javaGetBytes; ";
  const std::string make_line = "Insert javaNewString; ";
  for (const auto &failure : kFailures) {
    SCOPED_TRACE(failure.failing);
    failing = failure.failing;
    EXPECT_EQ(lines_of(get, nullptr), get_line + failure.get);
    EXPECT_EQ(lines_of(get_named, nullptr), get_line + failure.get);
    EXPECT_EQ(lines_of(make, nullptr), make_line + failure.make);
    EXPECT_EQ(lines_of(make_named, nullptr), failure.make);
  }
  failing = "NewStringUTF";
  EXPECT_EQ(lines_of(get_named, nullptr), get_line);
  EXPECT_EQ(lines_of(make_named, nullptr), "");

  failing = "";
  const int before = references;
  for (int round = 0; round < 2; ++round) {
    EXPECT_EQ(lines_of(get, &bytes), get_line);
    EXPECT_EQ(lines_of(get_named, &bytes), get_line);
    EXPECT_EQ(lines_of(make, &text), make_line);
    EXPECT_EQ(lines_of(make_named, &text), "");
  }
  // The class was kept from the time when only methods failed.
  EXPECT_EQ(references, before);

  EXPECT_EQ(cstr2jbyteArray(&environment, "text"), nullptr) << "no array to be had";
  EXPECT_EQ(jbyteArray2cstr(&environment, reference<jbyteArray>(bytes)), nullptr);
}

TEST(StringHelpers, FirstUseMayBeRaced) {
  constexpr int kThreads = 16;
  SetLogSink(LogNothing, nullptr);
  std::latch start(kThreads);
  std::atomic<int> right = 0;
  std::vector<std::thread> threads;
  for (int i = 0; i < kThreads; ++i) {
    threads.emplace_back([&] {
      start.arrive_and_wait();
      right += javaGetBytes(&environment, reference<jstring>(text)) == &bytes;
      right += javaNewString(&environment, reference<jbyteArray>(bytes)) == &text;
    });
  }
  for (std::thread &thread : threads) thread.join();
  EXPECT_EQ(right, 2 * kThreads);
  SetLogSink(nullptr, nullptr);
}

}  // namespace
}  // namespace orvalis::test
