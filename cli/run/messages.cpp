#include "cli/run/messages.h"

#include <cstring>
#include <initializer_list>
#include <string_view>

namespace {

// A message consists of texts, each preceded by its size.
std::string join(std::initializer_list<std::string_view> texts) {
    std::string message;
    for (const std::string_view text : texts) {
        const size_t size = text.size();
        message.append(reinterpret_cast<const char *>(&size), sizeof size).append(text);
    }
    return message;
}

bool split(std::string &received, std::initializer_list<std::string *> texts) {
    size_t end = 0;
    for (std::string *text : texts) {
        size_t size = 0;
        if (received.size() - end < sizeof size) return false;
        memcpy(&size, received.data() + end, sizeof size);
        end += sizeof size;
        if (received.size() - end < size) return false;
        text->assign(received, end, size);
        end += size;
    }
    received.erase(0, end);
    return true;
}

}  // namespace

std::string encode(const request &message) {
    return join({std::to_string(message.index), message.path, message.stored});
}

std::string encode(const reply &message) {
    const std::string status = std::to_string(static_cast<int>(message.status));
    return join({status, message.result, message.message, message.json, message.row});
}

bool decode(std::string &received, request &message) {
    std::string index;
    if (!split(received, {&index, &message.path, &message.stored})) return false;
    message.index = std::stoull(index);
    return true;
}

bool decode(std::string &received, reply &message) {
    std::string status;
    if (!split(received,
               {&status, &message.result, &message.message, &message.json, &message.row})) {
        return false;
    }
    message.status = static_cast<outcome>(std::stoi(status));
    return true;
}
