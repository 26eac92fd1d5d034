# Installs the library into a temporary staging folder, builds the consumer
# project against it with find_package and runs it.
# A sanitized library needs a sanitized host program.
set(OVRA_CONSUMER_FLAGS "")
if(OVRA_SANITIZE)
  set(OVRA_CONSUMER_FLAGS "-fsanitize=address,undefined")
endif()
add_test(NAME Consumer.FindPackageAndRun
  COMMAND ${CMAKE_COMMAND}
    -DBUILD_DIR=${CMAKE_BINARY_DIR}
    -DSOURCE=${CMAKE_CURRENT_SOURCE_DIR}/consumer
    -DGENERATOR=${CMAKE_GENERATOR}
    "-DEXTRA_FLAGS=${OVRA_CONSUMER_FLAGS}"
    -P ${CMAKE_CURRENT_SOURCE_DIR}/consumer/RunConsumer.cmake)
set_tests_properties(Consumer.FindPackageAndRun PROPERTIES TIMEOUT 600)
