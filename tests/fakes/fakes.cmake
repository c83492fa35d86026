# In-memory services of every kind that host/ declares; they record what they were asked.
add_library(rvd_fakes STATIC
  ${CMAKE_CURRENT_LIST_DIR}/Fake.cpp
  ${CMAKE_CURRENT_LIST_DIR}/FakeAccountStore.cpp
  ${CMAKE_CURRENT_LIST_DIR}/FakeClient.cpp
  ${CMAKE_CURRENT_LIST_DIR}/FakeFacebookRequests.cpp
  ${CMAKE_CURRENT_LIST_DIR}/FakeHost.cpp
  ${CMAKE_CURRENT_LIST_DIR}/FakeJSONReader.cpp
  ${CMAKE_CURRENT_LIST_DIR}/FakeKeychain.cpp
  ${CMAKE_CURRENT_LIST_DIR}/FakePreferences.cpp
  ${CMAKE_CURRENT_LIST_DIR}/FakeTexts.cpp
  ${CMAKE_CURRENT_LIST_DIR}/FakeUserNotifications.cpp)
target_link_libraries(rvd_fakes PUBLIC rvd_log rvd_json Threads::Threads)
