# cmake -DBUILD_DIR=... -DSOURCE=... -DGENERATOR=... [-DEXTRA_FLAGS=...] -P RunConsumer.cmake
# Stages an install in a fresh temporary folder, builds the consumer against
# it, runs it and checks the pkg-config file; the folder is removed again.
set(tmp "$ENV{TMPDIR}")
if(NOT tmp)
  set(tmp /tmp)
endif()
string(RANDOM LENGTH 10 suffix)
set(STAGE ${tmp}/ovra-consumer-${suffix})

function(fail message)
  file(REMOVE_RECURSE ${STAGE})
  message(FATAL_ERROR "${message}")
endfunction()

execute_process(COMMAND ${CMAKE_COMMAND} --install ${BUILD_DIR} --prefix ${STAGE}/usr
  OUTPUT_QUIET RESULT_VARIABLE rc)
if(rc)
  fail("install failed")
endif()
execute_process(COMMAND ${CMAKE_COMMAND} -S ${SOURCE} -B ${STAGE}/build -G ${GENERATOR}
  -DCMAKE_PREFIX_PATH=${STAGE}/usr "-DCMAKE_CXX_FLAGS=${EXTRA_FLAGS}"
  "-DCMAKE_EXE_LINKER_FLAGS=${EXTRA_FLAGS}" RESULT_VARIABLE rc)
if(rc)
  fail("configuring the consumer failed")
endif()
execute_process(COMMAND ${CMAKE_COMMAND} --build ${STAGE}/build RESULT_VARIABLE rc)
if(rc)
  fail("building the consumer failed")
endif()
file(MAKE_DIRECTORY ${STAGE}/user ${STAGE}/local)
execute_process(COMMAND ${CMAKE_COMMAND} -E env
  OVRAMETADATA_USER_ROOT=${STAGE}/user OVRAMETADATA_LOCAL_ROOT=${STAGE}/local
  ${STAGE}/build/consumer RESULT_VARIABLE rc)
if(rc)
  fail("the consumer failed: ${rc}")
endif()

# The pkg-config file must describe the installed library too.
find_program(PKG_CONFIG pkg-config)
if(PKG_CONFIG)
  execute_process(COMMAND ${CMAKE_COMMAND} -E env
    PKG_CONFIG_PATH=${STAGE}/usr/lib/pkgconfig:${STAGE}/usr/lib/x86_64-linux-gnu/pkgconfig
    ${PKG_CONFIG} --libs ovrametadata OUTPUT_VARIABLE libs RESULT_VARIABLE rc)
  if(rc OR NOT libs MATCHES "-lovrametadata")
    fail("pkg-config does not find ovrametadata: ${libs}")
  endif()
endif()
file(REMOVE_RECURSE ${STAGE})
