# Installs the client library into a folder of the test's own, builds each example against it, and runs it where no
# drive is served: it has to say so.
set(folder ${BUILD}/examples-test)
file(REMOVE_RECURSE ${folder})

function(run)
  execute_process(COMMAND ${ARGV} COMMAND_ERROR_IS_FATAL ANY OUTPUT_QUIET)
endfunction()

run(${CMAKE_COMMAND} --install ${BUILD} --component client --prefix ${folder}/prefix)
set(arguments_share_document somebody)  # besides the document
set(arguments_collaborate)
foreach(example IN ITEMS share_document collaborate)
  set(built ${folder}/${example})
  run(${CMAKE_COMMAND} -S ${EXAMPLES}/${example} -B ${built} -G Ninja -D CMAKE_PREFIX_PATH=${folder}/prefix
    -D CMAKE_CXX_COMPILER=${COMPILER} -D CMAKE_C_COMPILER=${C_COMPILER} -D CMAKE_CXX_FLAGS=${FLAGS}
    -D CMAKE_C_FLAGS=${FLAGS})
  run(${CMAKE_COMMAND} --build ${built})
  execute_process(COMMAND ${CMAKE_COMMAND} -E env DROXA_HOME=${folder}/nowhere ${built}/${example} a.txt ${arguments_${example}}
    RESULT_VARIABLE status ERROR_VARIABLE said)
  if(NOT status EQUAL 1 OR NOT said MATCHES "fileproviderd doesn't run")
    message(FATAL_ERROR "${example} ended with ${status} and said: ${said}")
  endif()
endforeach()
file(REMOVE_RECURSE ${folder})
