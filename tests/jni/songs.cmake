# Makes the songs of the tests in a real virtual machine, in a directory emptied first.
file(REMOVE_RECURSE ${DIRECTORY})
file(MAKE_DIRECTORY ${DIRECTORY}/files)
execute_process(COMMAND ${MAKE_SONG} ${DIRECTORY}/song.wav --seconds 20 --bpm 120 --loud-at 6
  COMMAND_ERROR_IS_FATAL ANY)
execute_process(COMMAND ${MAKE_SONG} ${DIRECTORY}/clip.wav --seconds 2 COMMAND_ERROR_IS_FATAL ANY)
