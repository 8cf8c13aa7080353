// The page's format table. It contains only WAV, because the browser decodes the songs.
#include "media_source/format_table.h"

const format_ops *format_ops_of(int32_t type) {
    static constexpr format_ops kWav = {kMtsrcTypeWav,      mtsource_wav_open,
                                        mtsource_wav_close, mtsource_wav_get_frm,
                                        mtsource_wav_seek,  mtsource_wav_reset};
    return type == kMtsrcTypeWav ? &kWav : nullptr;
}
