# Runs PROGRAM --plugin-dir=PLUGIN_DIR OPTION and writes its output to OUTPUT. With EXPECTED,
# fails when OUTPUT differs from that file (the checked-in copy is out of date).
execute_process(
    COMMAND ${PROGRAM} --plugin-dir=${PLUGIN_DIR} ${OPTION}
    OUTPUT_VARIABLE text
    ERROR_VARIABLE errors
    RESULT_VARIABLE status)
if(NOT status EQUAL 0 OR NOT errors STREQUAL "")
    message(FATAL_ERROR "${PROGRAM} ${OPTION} failed (${status}): ${errors}")
endif()
file(WRITE ${OUTPUT}.tmp "${text}")
file(RENAME ${OUTPUT}.tmp ${OUTPUT})
if(DEFINED EXPECTED)
    execute_process(COMMAND ${CMAKE_COMMAND} -E compare_files ${OUTPUT} ${EXPECTED} RESULT_VARIABLE differs)
    if(differs)
        message(FATAL_ERROR "${EXPECTED} is out of date: rebuild it with "
                            "'cmake --build <build dir> --target hadro_reference' and commit it.")
    endif()
endif()
