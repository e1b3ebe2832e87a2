# Runs one scenario through kpx-sim and checks what it produced.
#   -DSIM=kpx-sim -DSCENARIO=file
#   -DGOLDEN=file -DOUT=file          the JSONL event log must equal the golden
#   -DEXPECTED_STDERR=file            the run must fail with exit code 2 and
#                                     print exactly that file's text to stderr
cmake_minimum_required(VERSION 3.20)

if(DEFINED EXPECTED_STDERR)
  execute_process(COMMAND ${SIM} ${SCENARIO} --jsonl
    RESULT_VARIABLE code OUTPUT_VARIABLE out ERROR_VARIABLE err)
  file(READ ${EXPECTED_STDERR} expected)
  # The expected text names the scenario relative to its folder; the run
  # names it as given on the command line.
  get_filename_component(dir ${SCENARIO} DIRECTORY)
  string(REPLACE "${dir}/" "" err "${err}")
  if(NOT code EQUAL 2)
    message(FATAL_ERROR "kpx-sim exited with ${code}, expected 2\nstderr: ${err}")
  endif()
  if(NOT err STREQUAL expected)
    message(FATAL_ERROR "stderr differs\nexpected: ${expected}\nactual:   ${err}")
  endif()
  return()
endif()

get_filename_component(out_dir ${OUT} DIRECTORY)
file(MAKE_DIRECTORY ${out_dir})
execute_process(COMMAND ${SIM} ${SCENARIO} --jsonl --out ${OUT}
  RESULT_VARIABLE code ERROR_VARIABLE err)
if(NOT code EQUAL 0)
  message(FATAL_ERROR "kpx-sim exited with ${code}\n${err}")
endif()
execute_process(COMMAND ${CMAKE_COMMAND} -E compare_files ${GOLDEN} ${OUT} RESULT_VARIABLE differs)
if(differs)
  find_program(DIFF diff)
  if(DIFF)
    execute_process(COMMAND ${DIFF} -u ${GOLDEN} ${OUT})  # straight to the test's output, unwrapped
  endif()
  message(FATAL_ERROR "the event log differs from ${GOLDEN}. "
    "If the new log is right: cmake --build <build dir> --target update-goldens")
endif()
