// Recognises audio by the first bytes of a file, whatever its name, and explains why the library
// refused a file. Only the library decides whether a file can be used.
//
// Input: a path or bytes. Output: a file_kind, or a sentence. Used by inputs.h, song_file.h,
// run/analyse.h and report/report.h; player_offset.h uses the functions that read bytes.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

#include "include/tavo.h"

// mpeg is MPEG audio, Layers I to III; messages call it MP3.
enum class file_kind { unknown, wav, flac, ogg, mp4, aac, mpeg, aiff, asf, matroska };

constexpr size_t kKindBytes = 16;  // needed by recognise_bytes

// Recognises a format by the first bytes of a file, or by those after its ID3v2 tags.
file_kind recognise_bytes(std::string_view head);

// Returns 0, or errno if the file cannot be opened or read. Anything except a regular file has an
// unknown kind. Never blocks.
int recognise(const std::string &path, file_kind &kind);

// Returns up to `size` bytes of a regular file, starting at `offset`: fewer at the end of the file
// or after an error. `code` receives the errno of the error, or 0. Any other kind of file counts as
// empty. Never blocks.
std::string read_bytes(const std::string &path, int64_t offset, int64_t size, int &code);

// Returns the big-endian number of `size` bytes at `offset`, or 0 if it extends past the end.
uint64_t big_endian(std::string_view bytes, size_t offset, size_t size);

// Returns the offset of the first byte after the ID3v2 tags at the start of the file; 0 if the file
// has no such tag.
int64_t find_id3v2_end(const std::string &path, int &code);

// Returns the reason why the library refused a file. `code` is TAVO_ERR_MEMORY or the result of
// tavo_probe, which stored `stream`. Reads the file again to detect read errors.
std::string explain_refusal(const std::string &path, int32_t code, const TAVO_STREAM &stream);

// Returns the reason why an analysis received no audio or, with has_audio, only part of it.
std::string explain_lost_audio(const std::string &path, bool has_audio);
