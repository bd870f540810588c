# The Java methods in the library. They need jni.h to be built and nothing to run: the Java virtual
# machine hands its functions in.
set(java_sources java/java_streams.cpp jni/java_methods.cpp jni/java_strings.cpp)
target_sources(orvalis_objects PRIVATE ${java_sources})

if(NOT ANDROID)  # the NDK has jni.h among the system's headers
  find_package(Java 9 QUIET COMPONENTS Development)
  if(NOT Java_FOUND)
    message(FATAL_ERROR "ORVALIS_JAVA needs a JDK: install openjdk-17-jdk-headless, or switch the option off")
  endif()
  file(REAL_PATH ${Java_JAVAC_EXECUTABLE} jdk)
  cmake_path(GET jdk PARENT_PATH jdk)
  cmake_path(GET jdk PARENT_PATH jdk)
  find_path(ORVALIS_JNI_HEADERS jni.h PATHS ${jdk}/include NO_DEFAULT_PATH NO_CMAKE_FIND_ROOT_PATH
            DOC "Folder of the JDK's jni.h")
  if(NOT ORVALIS_JNI_HEADERS)
    message(FATAL_ERROR "There is no jni.h in ${jdk}/include: set ORVALIS_JNI_HEADERS to its folder")
  endif()
  set(ORVALIS_JNI_FOLDERS ${ORVALIS_JNI_HEADERS} ${ORVALIS_JNI_HEADERS}/linux)
  target_include_directories(orvalis_objects SYSTEM PRIVATE ${ORVALIS_JNI_FOLDERS})
endif()

# One export list for the linker and the tests: the engine's with Java's in front. A list with names
# that are not built would not do, for there are linkers that refuse those.
set_property(DIRECTORY APPEND PROPERTY CMAKE_CONFIGURE_DEPENDS
  cmake/orvalis.map cmake/java_exports.txt)
file(READ ${ORVALIS_EXPORT_LIST} exports)
file(STRINGS cmake/java_exports.txt java_exports REGEX "^[A-Za-z]")
foreach(name ${java_exports})
  string(REPLACE "  global:\n" "  global:\n    ${name};\n" exports "${exports}")
endforeach()
set(ORVALIS_EXPORT_LIST ${PROJECT_BINARY_DIR}/orvalis_with_java.map)
file(CONFIGURE OUTPUT ${ORVALIS_EXPORT_LIST} CONTENT "${exports}" @ONLY)
