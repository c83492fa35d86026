find_package(OpenSSL REQUIRED)
pkg_check_modules(HTTPLIB REQUIRED IMPORTED_TARGET cpp-httplib)
rvd_test(http_test
  SOURCES ${CMAKE_CURRENT_LIST_DIR}/http_facebook_requests_test.cpp
          ${CMAKE_CURRENT_LIST_DIR}/http_revocations_test.cpp
          ${CMAKE_CURRENT_LIST_DIR}/http_server_url_test.cpp
          ${CMAKE_CURRENT_LIST_DIR}/http_tls_test.cpp
          ${CMAKE_CURRENT_LIST_DIR}/http_transfer_test.cpp
  LIBRARIES rvd_http rvd_credentials rvd_fakes rvd_loopback_server rvd_certificates PkgConfig::HTTPLIB OpenSSL::SSL
            OpenSSL::Crypto)
rvd_test(http_name_resolution_test
  SOURCES ${CMAKE_CURRENT_LIST_DIR}/http_name_resolution_test.cpp
  LIBRARIES rvd_http rvd_fakes)
