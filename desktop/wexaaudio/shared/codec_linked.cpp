// Replaces codec_loaded.cpp in programs that link everything statically.
#include "desktop/wexaaudio/shared/codec_library.h"

const codec_library *codec_library_get(void) {
    return &wexaaudio_av;
}
