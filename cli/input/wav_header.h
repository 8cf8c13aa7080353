// What a WAV file's own header says, for the explanation of a refusal.
#ifndef TAVO_CLI_INPUT_WAV_HEADER_H
#define TAVO_CLI_INPUT_WAV_HEADER_H

#include <string>

// A sentence that names the parameter of the file at path that is not supported.
std::string explain_wav(const std::string &path);

#endif
