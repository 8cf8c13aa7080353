#include "pcm/decode_plan.h"

extern "C" int32_t tavo_probe(const char *path, TAVO_STREAM *stream) {
    if (stream != nullptr) *stream = {};
    const mtsrc_param param = {path};
    int32_t code = TAVO_OK;
    mtsrc_ctx *src = mtsrc_init(&param, &code);
    if (src == nullptr) return code;

    mtsrc_format format = {};
    code = mtsrc_getstream_format(src, &format);
    mtsrc_deinit(src);
    if (code == TAVO_OK) code = check_stream(format);
    if (stream != nullptr && code != TAVO_ERR_FORMAT) {
        *stream = {format.sample_rate, format.channels, format.duration / kUnitsPerMs};
    }
    return code;
}

extern "C" const char *tavo_error_text(int32_t code) {
    switch (code) {
        case TAVO_OK:
            return "no error";
        case TAVO_ERR_BUSY:
            return "another analysis is open";
        case TAVO_ERR_MEMORY:
            return "out of memory";
        case TAVO_ERR_FORMAT:
            return "the format is unknown or not supported";
        case TAVO_ERR_HANDLE:
            return "the handle or an argument is not valid, or the file is unusable";
        case TAVO_ERR_NOT_READY:
            return "the analysis was started before";
        case TAVO_ERR_READ:
            return "the file cannot be read or is too small";
        case TAVO_ERR_OPEN:
            return "the file cannot be opened or has no audio stream";
        case TAVO_ERR_SHORT:
            return "the audio lasts 1 s or less";
        case TAVO_ERR_LOW_RATE:
            return "the sample rate is below 8000 Hz";
        case TAVO_ERR_CODEC:
            return "the codec library failed";
        default:
            return "unknown error";
    }
}
