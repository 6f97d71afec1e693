# The library: all of src/ once as objects, for the shared object and for the tests alike.
file(GLOB ZUV_SOURCES CONFIGURE_DEPENDS ${PROJECT_SOURCE_DIR}/src/*/*.cpp)
add_library(zuv_objects STATIC ${ZUV_SOURCES})
target_include_directories(zuv_objects PUBLIC ${PROJECT_SOURCE_DIR}/include PRIVATE ${PROJECT_SOURCE_DIR}/src)
target_link_libraries(zuv_objects PUBLIC OpenSSL::SSL OpenSSL::Crypto ZLIB::ZLIB PRIVATE zuv_flags)

# Places that wait for a late reference hold pointers of any type, and a host may pass a null reference for the response.
target_compile_options(zuv_objects PRIVATE -fno-strict-aliasing -fno-delete-null-pointer-checks
    -ffile-prefix-map=${PROJECT_SOURCE_DIR}/=)

# The shared object: named and versioned as its file. OpenSSL and zlib come from the host's link line.
add_library(zuv_client_pro SHARED ${PROJECT_SOURCE_DIR}/cmake/empty.cpp)
target_link_options(zuv_client_pro PRIVATE
    -Wl,--whole-archive $<TARGET_FILE:zuv_objects> -Wl,--no-whole-archive
    -Wl,--version-script=${PROJECT_SOURCE_DIR}/cmake/exports.map -Wl,--as-needed)
add_dependencies(zuv_client_pro zuv_objects)
set_target_properties(zuv_client_pro PROPERTIES
    SUFFIX .so.${PROJECT_VERSION}
    LINK_FLAGS -Wl,-soname,libzuv_client_pro.so.${PROJECT_VERSION}
    NO_SONAME ON
    LINK_DEPENDS "${PROJECT_SOURCE_DIR}/cmake/exports.map;$<TARGET_FILE:zuv_objects>")
target_include_directories(zuv_client_pro INTERFACE ${PROJECT_SOURCE_DIR}/include)
