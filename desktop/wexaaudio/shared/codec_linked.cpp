// Replaces codec_loaded.cpp where everything is linked into one program.
#include "desktop/wexaaudio/shared/codec_library.h"

const codec_library *codec_library_get(void) {
    return &wexaaudio_av;
}
