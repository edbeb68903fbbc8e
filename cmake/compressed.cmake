# ironmoat_compressed(<result> <file> <name> <option>): `file`, with its @VARIABLES@ (@ONLY) or as it
# is (COPYONLY), as Debian's packages have papers: `result` is the path of <name>.gz.
function(ironmoat_compressed result file name option)
  configure_file(${file} ${CMAKE_CURRENT_BINARY_DIR}/${name} ${option})
  execute_process(COMMAND gzip -9nf ${CMAKE_CURRENT_BINARY_DIR}/${name} COMMAND_ERROR_IS_FATAL ANY)
  set(${result} ${CMAKE_CURRENT_BINARY_DIR}/${name}.gz PARENT_SCOPE)
endfunction()
