# Each folder of the tree is a library or a program whose link list says what it may use.
#
# A folder's headers are reached only through its own include root, a directory that holds one
# symbolic link to the folder. A target therefore sees "keld/…" only if it links droxa_keld, and an
# include that points upward fails the build.

# droxa_include_root(<folder> <variable>): makes the include root of a top-level folder.
function(droxa_include_root folder variable)
  set(root ${CMAKE_BINARY_DIR}/include-roots/${folder})
  file(MAKE_DIRECTORY ${root})
  file(CREATE_LINK ${CMAKE_SOURCE_DIR}/${folder} ${root}/${folder} SYMBOLIC)
  set(${variable} ${root} PARENT_SCOPE)
endfunction()

# droxa_library(<folder> [SOURCES …] [USES …] [PRIVATE …]): the library droxa_<folder> of a top-level folder.
# USES names the droxa libraries and system libraries that its headers need; PRIVATE those that only
# its implementation files see.
function(droxa_library folder)
  cmake_parse_arguments(ARG "" "NAME" "SOURCES;USES;PRIVATE" ${ARGN})
  if(NOT ARG_NAME)
    set(ARG_NAME droxa_${folder})
  endif()
  droxa_include_root(${folder} root)
  if(NOT ARG_SOURCES)
    add_library(${ARG_NAME} INTERFACE)
    target_include_directories(${ARG_NAME} INTERFACE ${root})
    return()
  endif()
  add_library(${ARG_NAME} STATIC ${ARG_SOURCES})
  target_include_directories(${ARG_NAME} PUBLIC ${root})
  target_link_libraries(${ARG_NAME} PUBLIC ${ARG_USES} Threads::Threads PRIVATE ${ARG_PRIVATE})
endfunction()
