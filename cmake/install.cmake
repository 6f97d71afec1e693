# What `cmake --install` lays down, in three components: runtime, development, tools. Packages of them: packages.cmake. To be
# included after all that adds programs.
include(CMakePackageConfigHelpers)
set(ZUV_CMAKE_DIR ${CMAKE_INSTALL_LIBDIR}/cmake/zuv_client_pro)

install(TARGETS zuv_client_pro EXPORT zuv_client_pro
    LIBRARY COMPONENT runtime NAMELINK_COMPONENT development
    INCLUDES DESTINATION ${CMAKE_INSTALL_INCLUDEDIR})
install(DIRECTORY include/zuv_client_pro ${ZUV_GENERATED_DIR}/include/zuv_client_pro
    DESTINATION ${CMAKE_INSTALL_INCLUDEDIR} COMPONENT development FILES_MATCHING PATTERN *.h)
install(DIRECTORY schema/ DESTINATION ${CMAKE_INSTALL_DATADIR}/zuv_client_pro/schema COMPONENT development
    FILES_MATCHING PATTERN *.xsd PATTERN *.wsdl)
install(DIRECTORY examples/ DESTINATION ${CMAKE_INSTALL_DOCDIR}/examples COMPONENT development
    FILES_MATCHING PATTERN *.cpp PATTERN *.h)

install(EXPORT zuv_client_pro NAMESPACE zuv_client_pro:: FILE zuv_client_pro-targets.cmake
    DESTINATION ${ZUV_CMAKE_DIR} COMPONENT development)
configure_package_config_file(cmake/zuv_client_pro-config.cmake.in ${PROJECT_BINARY_DIR}/zuv_client_pro-config.cmake
    INSTALL_DESTINATION ${ZUV_CMAKE_DIR})
write_basic_package_version_file(${PROJECT_BINARY_DIR}/zuv_client_pro-config-version.cmake COMPATIBILITY SameMinorVersion)
install(FILES ${PROJECT_BINARY_DIR}/zuv_client_pro-config.cmake ${PROJECT_BINARY_DIR}/zuv_client_pro-config-version.cmake
    DESTINATION ${ZUV_CMAKE_DIR} COMPONENT development)

# From the place of the .pc file, so that the tree may be moved.
file(RELATIVE_PATH ZUV_PC_PREFIX /${CMAKE_INSTALL_LIBDIR}/pkgconfig /)
string(REGEX REPLACE "/$" "" ZUV_PC_PREFIX ${ZUV_PC_PREFIX})
configure_file(cmake/zuv_client_pro.pc.in ${PROJECT_BINARY_DIR}/zuv_client_pro.pc @ONLY)
install(FILES ${PROJECT_BINARY_DIR}/zuv_client_pro.pc DESTINATION ${CMAKE_INSTALL_LIBDIR}/pkgconfig COMPONENT development)

install(FILES docs/host-guide.md DESTINATION ${CMAKE_INSTALL_DOCDIR} COMPONENT development)
if(NOT ZUV_BUILD_PROGRAMS)
    return()
endif()
foreach(program zuv-service zuv)
    install(CODE "if(NOT EXISTS \"$<TARGET_FILE:${program}>\")
        message(FATAL_ERROR \"${program} isn't built: first run cmake --build ${PROJECT_BINARY_DIR}, \"
            \"or install what is: cmake --install ${PROJECT_BINARY_DIR} --component runtime\")
    endif()" COMPONENT tools)
    install(TARGETS ${program} RUNTIME COMPONENT tools)
endforeach()
install(FILES cli/completion/zuv.bash DESTINATION ${CMAKE_INSTALL_DATADIR}/bash-completion/completions RENAME zuv COMPONENT tools)
set(ZUV_ZSH_COMPLETIONS ${CMAKE_INSTALL_DATADIR}/zsh/vendor-completions CACHE STRING
    "Where zsh looks for completions of packages; elsewhere than on Debian it is share/zsh/site-functions")
install(FILES cli/completion/zuv.zsh DESTINATION ${ZUV_ZSH_COMPLETIONS} RENAME _zuv COMPONENT tools)
install(FILES docs/command-line.md DESTINATION ${CMAKE_INSTALL_DOCDIR} COMPONENT tools)
install(FILES service/README.md DESTINATION ${CMAKE_INSTALL_DOCDIR} RENAME zuv-service.md COMPONENT tools)
