// Loads the table from libwexaaudio_av.so in the folder of the library that contains this code.
// That library stays loaded until the process ends.
#include <android/log.h>
#include <dlfcn.h>

#include <cstdio>
#include <cstring>
#include <mutex>

#include "desktop/wexaaudio/shared/codec_library.h"

namespace {

constexpr char kName[] = "libwexaaudio_av.so";

std::mutex lock;
const codec_library *loaded;  // guarded by lock

const codec_library *load() {
    // The path must be complete, because the sanitizers' dlopen ignores this library's own search
    // path.
    Dl_info self = {};
    char path[4096];
    if (dladdr(&lock, &self) == 0) return nullptr;
    const char *slash = strrchr(self.dli_fname, '/');
    const int folder = slash != nullptr ? static_cast<int>(slash + 1 - self.dli_fname) : 0;
    snprintf(path, sizeof path, "%.*s%s", folder, self.dli_fname, kName);
    void *library = dlopen(path, RTLD_LAZY | RTLD_LOCAL);
    void *table = library != nullptr ? dlsym(library, "wexaaudio_av") : nullptr;
    if (table == nullptr) {
        __android_log_print(ANDROID_LOG_ERROR, "wexaaudio",
                            "%s, which decodes AAC, MPEG audio, MP4 and Ogg, cannot be loaded: %s",
                            kName, dlerror());
    }
    return static_cast<const codec_library *>(table);
}

}  // namespace

const codec_library *codec_library_get(void) {
    const std::lock_guard<std::mutex> guard(lock);
    if (loaded == nullptr) loaded = load();
    return loaded;
}
