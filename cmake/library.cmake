# The library: all of src/ once as objects, for the shared object and for the tests alike.
file(GLOB ZUV_SOURCES CONFIGURE_DEPENDS ${PROJECT_SOURCE_DIR}/src/*/*.cpp)
if(ZUV_SHARED_OBJECTS) # bound to itself: what it asks for can be distinguished from what a test asks for
    add_library(zuv_objects SHARED ${ZUV_SOURCES})
    target_link_options(zuv_objects PRIVATE LINKER:-Bsymbolic-functions
        LINKER:--version-script=${PROJECT_SOURCE_DIR}/cmake/shared_objects.map)
else()
    add_library(zuv_objects STATIC ${ZUV_SOURCES})
endif()
target_include_directories(zuv_objects PUBLIC ${PROJECT_SOURCE_DIR}/include PRIVATE ${PROJECT_SOURCE_DIR}/src)
target_link_libraries(zuv_objects PUBLIC OpenSSL::SSL OpenSSL::Crypto ZLIB::ZLIB PRIVATE zuv_flags zuv_hardening)

# Places that wait for a late reference hold pointers of any type, and a host may pass a null reference for the response.
# Calls within a unit are not left open to a host that defines a function of the same name.
target_compile_options(zuv_objects PRIVATE -fno-strict-aliasing -fno-delete-null-pointer-checks
    -fno-semantic-interposition
    -ffile-prefix-map=${PROJECT_BINARY_DIR}/= -ffile-prefix-map=${PROJECT_SOURCE_DIR}/=)

# The shared object: soname and file name have the whole version. OpenSSL and zlib come from the host's link line, where the
# target brings them.
add_library(zuv_client_pro SHARED ${PROJECT_SOURCE_DIR}/cmake/empty.cpp)
set_target_properties(zuv_client_pro PROPERTIES
    VERSION ${PROJECT_VERSION}
    SOVERSION ${PROJECT_VERSION}
    LINK_DEPENDS "${PROJECT_SOURCE_DIR}/cmake/exports.map;$<TARGET_FILE:zuv_objects>")
target_compile_features(zuv_client_pro INTERFACE cxx_std_17)
target_include_directories(zuv_client_pro INTERFACE
    $<BUILD_INTERFACE:${PROJECT_SOURCE_DIR}/include>
    $<BUILD_INTERFACE:${PROJECT_BINARY_DIR}/generated/include>)
# A host that calls none of these itself needs them all the same, which a linker with --as-needed doesn't see.
target_link_libraries(zuv_client_pro INTERFACE -Wl,--push-state,--no-as-needed OpenSSL::SSL OpenSSL::Crypto ZLIB::ZLIB
    -Wl,--pop-state PRIVATE zuv_hardening)
target_link_options(zuv_client_pro PRIVATE
    -Wl,--whole-archive $<TARGET_FILE:zuv_objects> -Wl,--no-whole-archive
    -Wl,--version-script=${PROJECT_SOURCE_DIR}/cmake/exports.map)
add_dependencies(zuv_client_pro zuv_objects)
add_library(zuv_client_pro::zuv_client_pro ALIAS zuv_client_pro) # the name that find_package gives

# Only these libraries are named as needed. What the compiler leaves to the unwinder (_Unwind_Resume) is found in the one
# that the C++ runtime brings into every process; a copy of its own would be a second unwinder under the host's exceptions.
# The counters of coverage need libraries of their own.
if(NOT ZUV_COVERAGE)
    target_link_options(zuv_client_pro PRIVATE -nodefaultlibs)
    target_link_libraries(zuv_client_pro PRIVATE stdc++ m c gcc)
endif()

# What the programs are linked with: the library as it is handed out; its objects where a tool looks into them.
set(ZUV_PROGRAM_LIBRARY zuv_client_pro)
if(ZUV_SANITIZE OR ZUV_THREADS OR ZUV_FUZZ OR ZUV_COVERAGE OR ZUV_SHARED_OBJECTS)
    set(ZUV_PROGRAM_LIBRARY zuv_objects)
endif()
