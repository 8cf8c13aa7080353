# Real files at the borders of what is accepted, and very large ones; the full tier needs 8 GiB of
# memory and 5 GiB in the temporary folder.
tavo_test(trial_limits ${CMAKE_CURRENT_LIST_DIR}/limits.cpp LIBS codec_test trial)
