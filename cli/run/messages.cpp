#include "cli/run/messages.h"

#include <cstring>
#include <nlohmann/json.hpp>

NLOHMANN_DEFINE_TYPE_NON_INTRUSIVE(request, index, path, stored)
NLOHMANN_DEFINE_TYPE_NON_INTRUSIVE(reply, status, result, message, json, row)

// An encoded message is a CBOR object, preceded by its size in bytes. Its texts may contain any
// bytes, because neither side checks that they are UTF-8.

template <typename record_type>
std::string encode(const record_type &message) {
    std::string bytes;
    nlohmann::json::to_cbor(message, bytes);
    const size_t size = bytes.size();
    return std::string(reinterpret_cast<const char *>(&size), sizeof size) + bytes;
}

template <typename record_type>
bool decode(std::string &received, record_type &message) {
    size_t size = 0;
    if (received.size() < sizeof size) return false;
    memcpy(&size, received.data(), sizeof size);
    if (received.size() - sizeof size < size) return false;
    nlohmann::json::from_cbor(received.substr(sizeof size, size)).get_to(message);
    received.erase(0, sizeof size + size);
    return true;
}

template std::string encode(const request &message);
template std::string encode(const reply &message);
template bool decode(std::string &received, request &message);
template bool decode(std::string &received, reply &message);
