pkg_check_modules(ICU_FOR_TEXTS REQUIRED IMPORTED_TARGET icu-uc)
add_library(hostile_texts STATIC support/HostileTexts.cpp)
target_link_libraries(hostile_texts PUBLIC PkgConfig::ICU_FOR_TEXTS)
