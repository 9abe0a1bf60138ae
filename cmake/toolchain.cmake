# Warnings are errors; ccache and mold serve when present.
add_compile_options(-Wall -Wextra -Wpedantic -Wconversion -Wsign-conversion -Wnon-virtual-dtor -Werror)

# What nobody calls is left out of the programs.
add_compile_options("$<$<NOT:$<CONFIG:Debug>>:-ffunction-sections;-fdata-sections>")
add_link_options($<$<NOT:$<CONFIG:Debug>>:-Wl,--gc-sections>)

# What is shipped is hardened as Debian hardens its packages, and against stack clashes and bent control flow besides.
if(NOT VRX_SANITIZE)
    set(hardening -U_FORTIFY_SOURCE -D_FORTIFY_SOURCE=2 -fPIE -fstack-protector-strong -fstack-clash-protection)
    if(CMAKE_SYSTEM_PROCESSOR MATCHES "^(x86_64|AMD64|i.86)$")
        list(APPEND hardening -fcf-protection)
    elseif(CMAKE_SYSTEM_PROCESSOR MATCHES "^(aarch64|arm64)$")
        list(APPEND hardening -mbranch-protection=standard)
    endif()
    add_compile_options("$<$<NOT:$<CONFIG:Debug>>:${hardening}>")
    add_link_options("$<$<NOT:$<CONFIG:Debug>>:-pie;LINKER:-z,relro,-z,now>")
endif()

find_program(VRX_CCACHE ccache)
if(VRX_CCACHE)
    set(CMAKE_CXX_COMPILER_LAUNCHER ${VRX_CCACHE})
endif()
find_program(VRX_MOLD mold)
if(VRX_MOLD)
    add_link_options(-fuse-ld=mold)
endif()

if(VRX_SANITIZE)
    add_compile_options(-fsanitize=${VRX_SANITIZE} -fno-omit-frame-pointer -fno-sanitize-recover=all)
    add_link_options(-fsanitize=${VRX_SANITIZE})
    if(CMAKE_CXX_COMPILER_ID STREQUAL "GNU")
        add_compile_options(-Wno-maybe-uninitialized)  # instrumented code gives false ones
    endif()
endif()
if(VRX_FUZZ)
    add_compile_options(-fsanitize=fuzzer-no-link)
endif()
