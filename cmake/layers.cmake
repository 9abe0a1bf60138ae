# vrx_layer(NAME FOLDERS folder... [USES layer...] [LIBRARIES target...])
#
# A layer is a static library vrx_NAME of whole folders of src/. A folder inside another layer's folder belongs to its own
# layer alone. Headers are included as "vrx/FOLDER/…" through an include root of the layer's own, build/layers/NAME: a file
# can include only what its layer names in USES, because for the compiler no other header exists.
#
# vrx_finish_layers() gives the layers their sources and include roots once all are declared, so that the order of the
# calls of vrx_layer does not decide.
function(vrx_layer name)
    cmake_parse_arguments(LAYER "" "" "FOLDERS;USES;LIBRARIES" ${ARGN})
    list(TRANSFORM LAYER_USES PREPEND vrx_)
    set(root ${CMAKE_BINARY_DIR}/layers/${name})
    list(TRANSFORM LAYER_FOLDERS PREPEND ${CMAKE_SOURCE_DIR}/src/ OUTPUT_VARIABLE paths)
    list(TRANSFORM paths APPEND /*.cpp OUTPUT_VARIABLE patterns)
    file(GLOB_RECURSE sources CONFIGURE_DEPENDS ${patterns})
    if(sources)
        add_library(vrx_${name} STATIC)
        target_include_directories(vrx_${name} PUBLIC ${root})
        target_link_libraries(vrx_${name} PUBLIC ${LAYER_USES} PRIVATE ${LAYER_LIBRARIES})
    else()  # headers only
        add_library(vrx_${name} INTERFACE)
        target_include_directories(vrx_${name} INTERFACE ${root})
        target_link_libraries(vrx_${name} INTERFACE ${LAYER_USES} ${LAYER_LIBRARIES})
    endif()
    set_property(GLOBAL APPEND PROPERTY VRX_LAYERS ${name})
    set_property(GLOBAL PROPERTY VRX_LAYER_${name}_FOLDERS ${LAYER_FOLDERS})
    set_property(GLOBAL PROPERTY VRX_LAYER_${name}_SOURCES ${sources})
    set_property(GLOBAL APPEND PROPERTY VRX_LAYER_FOLDERS ${LAYER_FOLDERS})
endfunction()

function(vrx_finish_layers)
    file(REMOVE_RECURSE ${CMAKE_BINARY_DIR}/layers)  # no folder that has left a layer stays behind
    get_property(layers GLOBAL PROPERTY VRX_LAYERS)
    foreach(name ${layers})
        get_property(folders GLOBAL PROPERTY VRX_LAYER_${name}_FOLDERS)
        get_property(sources GLOBAL PROPERTY VRX_LAYER_${name}_SOURCES)
        foreach(folder ${folders})
            vrx_folders_within(nested ${folder})
            foreach(inner ${nested})
                list(FILTER sources EXCLUDE REGEX "^${CMAKE_SOURCE_DIR}/src/${inner}/")
            endforeach()
            vrx_link_folder(${CMAKE_BINARY_DIR}/layers/${name}/vrx ${folder} "${nested}")
        endforeach()
        if(sources)
            target_sources(vrx_${name} PRIVATE ${sources})
        endif()
    endforeach()
endfunction()

# The folders of other layers that lie inside a folder.
function(vrx_folders_within result folder)
    get_property(all GLOBAL PROPERTY VRX_LAYER_FOLDERS)
    list(FILTER all INCLUDE REGEX "^${folder}/")
    set(${result} ${all} PARENT_SCOPE)
endfunction()

# A folder that holds none of another layer is one link; else each of its entries is linked by itself.
function(vrx_link_folder root folder nested)
    get_filename_component(parent ${root}/${folder} DIRECTORY)
    file(MAKE_DIRECTORY ${parent})
    if(NOT nested)
        file(CREATE_LINK ${CMAKE_SOURCE_DIR}/src/${folder} ${root}/${folder} SYMBOLIC)
        return()
    endif()
    file(MAKE_DIRECTORY ${root}/${folder})
    file(GLOB entries CONFIGURE_DEPENDS RELATIVE ${CMAKE_SOURCE_DIR}/src ${CMAKE_SOURCE_DIR}/src/${folder}/*)
    foreach(entry ${entries})
        if(NOT entry IN_LIST nested)
            file(CREATE_LINK ${CMAKE_SOURCE_DIR}/src/${entry} ${root}/${entry} SYMBOLIC)
        endif()
    endforeach()
endfunction()
