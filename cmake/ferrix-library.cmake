# ferrix_library(NAME FOLDER dir HEADERS a.h b.h SOURCES x.cpp DEPENDS lib...)
#
# One library of a source folder. Its headers are reached as "FOLDER/a.h", and only by those who
# declare it under DEPENDS: each library has an include folder of its own in the build tree that
# holds links to its headers alone, so that an include against the order of the layers does not
# compile. FOLDER defaults to the name of the current folder.
function(ferrix_library name)
    cmake_parse_arguments(arg "" "FOLDER" "HEADERS;SOURCES;DEPENDS;PRIVATE_DEPENDS" ${ARGN})
    if(NOT arg_FOLDER)
        get_filename_component(arg_FOLDER ${CMAKE_CURRENT_SOURCE_DIR} NAME)
    endif()
    set(include_dir ${CMAKE_BINARY_DIR}/include/${name})
    file(MAKE_DIRECTORY ${include_dir}/${arg_FOLDER})
    foreach(header IN LISTS arg_HEADERS)
        get_filename_component(base ${header} NAME)
        get_filename_component(real ${header} ABSOLUTE)
        # A header of include/utils keeps the name of its own folder.
        get_filename_component(parent ${real} DIRECTORY)
        get_filename_component(folder ${parent} NAME)
        file(MAKE_DIRECTORY ${include_dir}/${folder})
        file(CREATE_LINK ${real} ${include_dir}/${folder}/${base} SYMBOLIC)
    endforeach()
    if(arg_SOURCES)
        add_library(${name} STATIC ${arg_SOURCES})
        target_include_directories(${name} PUBLIC ${include_dir})
        target_link_libraries(${name} PUBLIC ${arg_DEPENDS} Threads::Threads
                                      PRIVATE ${arg_PRIVATE_DEPENDS})
    else()
        add_library(${name} INTERFACE)
        target_include_directories(${name} INTERFACE ${include_dir})
        target_link_libraries(${name} INTERFACE ${arg_DEPENDS})
    endif()
endfunction()
