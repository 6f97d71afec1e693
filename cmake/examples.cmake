# The example hosts.
add_executable(profile_host ${PROJECT_SOURCE_DIR}/examples/profile_host.cpp)
target_link_libraries(profile_host PRIVATE zuv_objects zuv_flags)
add_executable(guide ${PROJECT_SOURCE_DIR}/examples/guide.cpp)
target_link_libraries(guide PRIVATE zuv_objects zuv_flags)
