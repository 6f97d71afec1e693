# What is handed out, the library and the programs, is compiled and linked so that an overrun ends the program before it can
# be put to use. tests/package/hardening_test.py reads from the files that it is so. A build for a sanitizer or for coverage
# goes without: it isn't handed out, and a sanitizer sees more by itself.
include(CheckCXXCompilerFlag)
include(CheckPIESupported)
check_pie_supported(LANGUAGES CXX)
add_library(zuv_hardening INTERFACE)
if(ZUV_SANITIZE OR ZUV_THREADS OR ZUV_FUZZ OR ZUV_COVERAGE)
    return()
endif()
foreach(flag -fstack-protector-strong -fstack-clash-protection -fcf-protection) # the last one: x86 alone has it
    string(MAKE_C_IDENTIFIER "ZUV_HAS${flag}" known)
    check_cxx_compiler_flag(${flag} ${known})
    if(${known})
        target_compile_options(zuv_hardening INTERFACE ${flag})
    endif()
endforeach()
# The C library checks sizes in optimised code only, and says so loudly elsewhere.
target_compile_options(zuv_hardening INTERFACE
    "$<$<CONFIG:Release,RelWithDebInfo,MinSizeRel>:SHELL:-U_FORTIFY_SOURCE -D_FORTIFY_SOURCE=3>")
target_link_options(zuv_hardening INTERFACE LINKER:-z,relro,-z,now,-z,noexecstack,-z,text)
