# droxa_schemas(<name> <schema>…): the library of what the schema compiler makes of the schemas. Generated code is no
# code of ours: it is built without the warnings, and its headers count as the system's.
function(droxa_schemas name)
  set(CAPNPC_SRC_PREFIX ${CMAKE_SOURCE_DIR})
  set(CAPNPC_IMPORT_DIRS ${CMAKE_SOURCE_DIR})
  set(CAPNPC_OUTPUT_DIR ${CMAKE_BINARY_DIR}/schemas/${name})
  file(MAKE_DIRECTORY ${CAPNPC_OUTPUT_DIR})
  capnp_generate_cpp(sources headers ${ARGN})
  add_library(${name} STATIC ${sources} ${headers})
  target_compile_options(${name} PRIVATE -w)
  target_include_directories(${name} SYSTEM PUBLIC ${CAPNPC_OUTPUT_DIR})
  target_link_libraries(${name} PUBLIC CapnProto::capnp-rpc)
endfunction()
