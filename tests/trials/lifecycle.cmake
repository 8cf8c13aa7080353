# Instances made, used and destroyed again and again. Needs the real library under ThreadSanitizer too.
tavo_test(trial_lifecycle ${CMAKE_CURRENT_LIST_DIR}/lifecycle.cpp LIBS song trial)
