# Packs the files of FOLDER, except build files, into the jar OUTPUT with MANIFEST. JAR is the jar tool.
file(GLOB_RECURSE files RELATIVE ${FOLDER} ${FOLDER}/*)
list(FILTER files EXCLUDE REGEX "CMakeLists|cmake$|\\.in$")
set(arguments "")
foreach(file ${files})
  string(APPEND arguments "-C \"${FOLDER}\" \"${file}\"\n")
endforeach()
file(WRITE ${OUTPUT}.files "${arguments}")
execute_process(COMMAND ${JAR} --create --date=2026-01-01T00:00:00Z --file ${OUTPUT} --manifest ${MANIFEST}
  @${OUTPUT}.files COMMAND_ERROR_IS_FATAL ANY)
file(REMOVE ${OUTPUT}.files)
