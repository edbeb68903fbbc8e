# The start-up sequence, step by step, and the exit status once the server's run returns.
execute_process(COMMAND ${PROGRAM} --version extra RESULT_VARIABLE status OUTPUT_VARIABLE steps)
set(expected "direct mode 1
read-only mode 1
shared server read
registered DrelUserPayload: VeskCorvelPayloadUnpacker
registered VeskCommandResponse: VeskCommandResponseUnpacker
registered VeskCommandWebTunnelResponse: VeskCommandWebTunnelResponseUnpacker
run
")
if(NOT status EQUAL 0)
  message(FATAL_ERROR "exit status ${status}")
endif()
if(NOT steps STREQUAL expected)
  message(FATAL_ERROR "the steps were:\n${steps}")
endif()
