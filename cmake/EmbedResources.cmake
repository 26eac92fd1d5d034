# Compiles resource files into a C++ source that registers them with the
# ovracore resource store. No external tool: CMake itself writes the bytes.
set(OVRA_EMBED_SCRIPT ${CMAKE_CURRENT_LIST_DIR}/EmbedResourcesScript.cmake)

# ovra_embed_resources(<out-var> <function-name> files...)
# Generates <function-name>.cpp defining
#   const ovracore::ResourceTable& <function-name>();
# Each resource is named by its file title and typed by its extension.
function(ovra_embed_resources out_var function_name)
  set(out ${CMAKE_CURRENT_BINARY_DIR}/${function_name}.cpp)
  string(REPLACE ";" "|" files_arg "${ARGN}")
  add_custom_command(OUTPUT ${out}
    COMMAND ${CMAKE_COMMAND} -DOUTPUT=${out} -DFUNCTION=${function_name}
            "-DFILES=${files_arg}" -P ${OVRA_EMBED_SCRIPT}
    DEPENDS ${ARGN} ${OVRA_EMBED_SCRIPT}
    COMMENT "Embedding resources into ${function_name}"
    VERBATIM)
  set(${out_var} ${out} PARENT_SCOPE)
endfunction()
