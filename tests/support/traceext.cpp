// A library that leaves a trace file when anything loads it: the witness
// that a connection value was not read as a key of its own (LoadExt).
#include <cstdio>
#include <cstdlib>

__attribute__((constructor)) static void leaveTrace()
{
    const char* path = std::getenv("TAGORA_TRACE_FILE");
    std::FILE* f = path ? std::fopen(path, "w") : nullptr;
    if (f) {
        std::fputs("loaded\n", f);
        std::fclose(f);
    }
}

// The entry point SQLite looks for, so the load itself succeeds.
extern "C" int sqlite3_extension_init(void* db, char** error, const void* api)
{
    (void)db;
    (void)error;
    (void)api;
    return 0;
}
