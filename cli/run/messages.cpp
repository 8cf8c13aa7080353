#include "cli/run/messages.h"

#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstring>

namespace {

// A message is a head and the texts, one after the other.

template <size_t kTexts>
struct message_head {
    uint64_t number;
    uint64_t text_bytes[kTexts];
};

template <size_t kTexts>
std::string join(uint64_t number, const std::array<const std::string *, kTexts> &texts) {
    message_head<kTexts> head = {number, {}};
    size_t size = sizeof head;
    for (size_t i = 0; i < kTexts; ++i) size += head.text_bytes[i] = texts[i]->size();
    std::string out;
    out.reserve(size);
    out.append(reinterpret_cast<const char *>(&head), sizeof head);
    for (const std::string *text : texts) out += *text;
    return out;
}

template <size_t kTexts>
bool split(std::string &received, uint64_t &number,
           const std::array<std::string *, kTexts> &texts) {
    message_head<kTexts> head{};
    if (received.size() < sizeof head) return false;
    memcpy(&head, received.data(), sizeof head);
    size_t size = sizeof head;
    for (const uint64_t bytes : head.text_bytes) size += bytes;
    if (received.size() < size) return false;
    number = head.number;
    size_t at = sizeof head;
    for (size_t i = 0; i < kTexts; ++i) {
        *texts[i] = received.substr(at, head.text_bytes[i]);
        at += head.text_bytes[i];
    }
    received.erase(0, size);
    return true;
}

}  // namespace

const std::string kEmptyReply = encode(reply());

std::string encode(const request &message) {
    return join<2>(message.index, {&message.path, &message.stored});
}

std::string encode(const reply &message) {
    return join<4>(static_cast<uint64_t>(message.status),
                   {&message.result, &message.message, &message.json, &message.row});
}

bool decode(std::string &received, request &message) {
    return split<2>(received, message.index, {&message.path, &message.stored});
}

bool decode(std::string &received, reply &message) {
    uint64_t status = 0;
    const bool is_whole = split<4>(
        received, status, {&message.result, &message.message, &message.json, &message.row});
    if (is_whole) message.status = static_cast<outcome>(status);
    return is_whole;
}

int write_all(int fd, const char *data, size_t size) {
    for (size_t done = 0; done < size;) {
        const ssize_t got = write(fd, data + done, size - done);
        if (got < 0 && errno != EINTR) return errno;
        if (got > 0) done += static_cast<size_t>(got);
    }
    return 0;
}
