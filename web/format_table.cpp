// The formats of the page: only WAV, because the page decodes the song and passes it as WAV.
#include "media_source/format_table.h"

const format_ops *format_ops_of(int32_t type) {
    static constexpr format_ops kWav = {kMtsrcTypeWav,      mtsource_wav_open,
                                        mtsource_wav_close, mtsource_wav_get_frm,
                                        mtsource_wav_seek,  mtsource_wav_reset};
    return type == kMtsrcTypeWav ? &kWav : nullptr;
}
