# The example hosts.
add_executable(profile_host ${PROJECT_SOURCE_DIR}/examples/profile_host.cpp)
target_link_libraries(profile_host PRIVATE zuv_objects zuv_flags)
