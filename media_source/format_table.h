// Maps a file's type code to the operations of its format source. Called by mtsrc.cpp.
#pragma once

#include "media_source/mtsrc_ctx.h"

struct format_ops {
    int32_t type;  // type code (mtsrc.h)
    int32_t (*open)(mtsrc_ctx *src);
    void (*close)(mtsrc_ctx *src);
    int32_t (*get_frm)(mtsrc_ctx *src, int32_t want, mtsrc_frame *frame);
    int32_t (*seek)(mtsrc_ctx *src, int64_t position, int64_t *reached);
    int32_t (*reset)(mtsrc_ctx *src);
};

// Returns the operations, or null if no format source reads files of this type.
const format_ops *format_ops_of(int32_t type);
