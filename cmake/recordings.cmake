# Real recordings for tests and benchmarks: read speech, spoken numbers and commands at 16 kHz
# (package pocketsphinx-testdata) and 8 kHz speech (package codec2-examples).
set(ORVALIS_SPEECH_16K /usr/share/pocketsphinx/test/data CACHE PATH "Folder of the 16 kHz recordings")
set(ORVALIS_SPEECH_8K /usr/share/codec2 CACHE PATH "Folder of the 8 kHz recordings")
foreach(folder ${ORVALIS_SPEECH_16K} ${ORVALIS_SPEECH_8K})
  if(NOT IS_DIRECTORY ${folder})
    message(FATAL_ERROR "Tests and benchmarks need recordings in ${folder}: install pocketsphinx-testdata and codec2-examples")
  endif()
endforeach()

add_library(orvalis_recordings INTERFACE)
target_compile_definitions(orvalis_recordings INTERFACE
  ORVALIS_SPEECH_16K="${ORVALIS_SPEECH_16K}" ORVALIS_SPEECH_8K="${ORVALIS_SPEECH_8K}")
