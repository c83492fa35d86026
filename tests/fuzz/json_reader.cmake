option(RVD_FUZZERS "build the fuzz targets (clang)" OFF)
# libFuzzer comes with clang alone. Run as: json_reader_fuzz -max_total_time=60
if(RVD_FUZZERS AND CMAKE_CXX_COMPILER_ID STREQUAL "Clang")
  add_executable(json_reader_fuzz ${CMAKE_CURRENT_LIST_DIR}/json_reader_fuzz.cpp
                 ${CMAKE_SOURCE_DIR}/daemon/http/JSONReader.cpp)
  target_compile_options(json_reader_fuzz PRIVATE -fsanitize=fuzzer,address,undefined -fno-sanitize-recover=all)
  target_link_options(json_reader_fuzz PRIVATE -fsanitize=fuzzer,address,undefined)
endif()
