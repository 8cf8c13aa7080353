#include "media_source/format_table.h"

namespace {

constexpr format_ops kFormats[] = {
    {kMtsrcTypeMp4, mtsource_mp4a_open, mtsource_mp4a_close, mtsource_mp4a_get_frm,
     mtsource_mp4a_seek, mtsource_mp4a_reset},
    {kMtsrcTypeOgg, mtsource_ogg_open, mtsource_ogg_close, mtsource_ogg_get_frm, mtsource_ogg_seek,
     mtsource_ogg_reset},
    {kMtsrcTypeWav, mtsource_wav_open, mtsource_wav_close, mtsource_wav_get_frm, mtsource_wav_seek,
     mtsource_wav_reset},
    {kMtsrcTypeAac, mtsource_aac_open, mtsource_aac_close, mtsource_aac_get_frm, mtsource_aac_seek,
     mtsource_aac_reset},
    {kMtsrcTypeMpegLayer1, mtsource_mp123_open, mtsource_mp123_close, mtsource_mp123_get_frm,
     mtsource_mp123_seek, mtsource_mp123_reset},
    {kMtsrcTypeMpegLayer2, mtsource_mp123_open, mtsource_mp123_close, mtsource_mp123_get_frm,
     mtsource_mp123_seek, mtsource_mp123_reset},
    {kMtsrcTypeMpegLayer3, mtsource_mp123_open, mtsource_mp123_close, mtsource_mp123_get_frm,
     mtsource_mp123_seek, mtsource_mp123_reset},
    {kMtsrcTypeFlac, mtsource_flac_open, mtsource_flac_close, mtsource_flac_get_frm,
     mtsource_flac_seek, mtsource_flac_reset},
};

}  // namespace

const format_ops *format_ops_of(int32_t type) {
    for (const format_ops &format : kFormats) {
        if (format.type == type) return &format;
    }
    return nullptr;
}
