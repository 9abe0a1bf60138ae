# Warnings are errors; ccache and mold serve when present.
add_compile_options(-Wall -Wextra -Wpedantic -Wconversion -Wsign-conversion -Wnon-virtual-dtor -Werror)

# What nobody calls is left out of the programs.
add_compile_options("$<$<NOT:$<CONFIG:Debug>>:-ffunction-sections;-fdata-sections>")
add_link_options($<$<NOT:$<CONFIG:Debug>>:-Wl,--gc-sections>)

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
