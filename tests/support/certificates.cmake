find_package(OpenSSL REQUIRED)
add_library(rvd_certificates STATIC ${CMAKE_CURRENT_LIST_DIR}/Certificates.cpp)
target_link_libraries(rvd_certificates PUBLIC OpenSSL::Crypto)
