set(CMAKE_CXX_STANDARD 20)
set(CMAKE_CXX_STANDARD_REQUIRED ON)
set(CMAKE_CXX_EXTENSIONS OFF)
set(CMAKE_C_STANDARD 11)
set(CMAKE_POSITION_INDEPENDENT_CODE ON)
set(CMAKE_EXPORT_COMPILE_COMMANDS ON)
set(THREADS_PREFER_PTHREAD_FLAG ON)
find_package(Threads REQUIRED)

# 32-bit ARM is a target: offsets and times have 64 bits everywhere (platform/abi-check.cpp asserts it).
add_compile_definitions(_GNU_SOURCE _FILE_OFFSET_BITS=64 _TIME_BITS=64)

add_compile_options(-Wall -Wextra -Wpedantic -Wshadow -Wformat=2 -Werror)
add_compile_options($<$<COMPILE_LANGUAGE:CXX>:-Wnon-virtual-dtor>)
if(CMAKE_CXX_COMPILER_ID STREQUAL "GNU")
    # GCC 12 reports std::string concatenation as overlapping copies when it optimises.
    add_compile_options(-Wno-restrict)
endif()
# Log lines name the source file as it stands in the repository, whatever machine built it.
add_compile_options(-ffile-prefix-map=${CMAKE_SOURCE_DIR}/=)

if(FERRIX_SANITIZE)
    # Line numbers are enough for a report; whole debug information costs a fifth of the build.
    add_compile_options(-fsanitize=${FERRIX_SANITIZE} -fno-omit-frame-pointer
                        -fno-sanitize-recover=all -O1 -g1)
    add_link_options(-fsanitize=${FERRIX_SANITIZE})
endif()
