// torture.cpp - see torture.h. Here: whose an allocation is, the numbering, the list of live blocks, the report.
#ifdef ZUV_SHARED_OBJECTS
#include "support/torture.h"

#include <algorithm>
#include <atomic>
#include <cerrno>
#include <csignal>
#include <cstdarg>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <mutex>
#include <new>
#include <utility>

#include <dlfcn.h>
#include <fcntl.h>
#include <link.h>
#include <unistd.h>
#include <unwind.h>

namespace torture {

namespace {

constexpr std::size_t BLOCKS_MAX = 1 << 18; // live blocks of the library that are kept track of
constexpr std::size_t PATHS_MAX = 1 << 16;  // ways to an allocation
constexpr std::uint64_t LOOKED_AT = 20000;  // allocations whose way is looked at
constexpr int PATH_DEPTH = 5;               // functions of the library that make up a way
constexpr int UNWIND_DEPTH = 48;            // frames looked at

struct range {
    std::uintptr_t from = 0, to = 0;
    bool holds(std::uintptr_t address) const { return address >= from && address < to; }
};

struct live_block {
    void *block;
    std::uintptr_t caller;
};

bool armed = false, wants_paths = false, program_too = false;
std::uint64_t refused_number = 0;
std::atomic<std::uint64_t> asked{0};
int report_file = -1;
range library, program, runtime; // code of the library, the executable and libstdc++
std::mutex lock;
live_block blocks[BLOCKS_MAX]; // open addressing
std::uint64_t paths[PATHS_MAX];
thread_local bool inside = false; // the unwinder's own allocations

void report(const char *format, ...)
{
    char line[1024];
    va_list arguments;
    va_start(arguments, format);
    const int length = std::vsnprintf(line, sizeof line, format, arguments);
    va_end(arguments);
    const ssize_t written =
        write(report_file, line, std::min(static_cast<std::size_t>(length), sizeof line - 1));
    if (written < 0 && errno != EFBIG) // which a test may have its service meet, for a while
        _exit(99);
}

// Function and offset, as addr2line and nm know them.
const char *site(std::uintptr_t address, char (&text)[256])
{
    Dl_info found{};
    if (dladdr(reinterpret_cast<void *>(address), &found) == 0)
        return "?";
    const char *file = std::strrchr(found.dli_fname, '/');
    std::snprintf(text, sizeof text, "%s(%s+0x%zx)", file ? file + 1 : found.dli_fname,
                  found.dli_sname ? found.dli_sname : "",
                  address - reinterpret_cast<std::uintptr_t>(found.dli_fbase));
    return text;
}

// Whose an allocation is.

struct walk {
    bool past_runtime = false;
    std::uintptr_t owner = 0; // below the runtime, the innermost address of the library or the program
    std::uint64_t key = 1469598103934665603u;
    int frames = 0, deep = 0;
};

bool counts(std::uintptr_t address)
{
    return library.holds(address) || (program_too && program.holds(address));
}

_Unwind_Reason_Code step_to_owner(_Unwind_Context *context, void *argument)
{
    walk &way = *static_cast<walk *>(argument);
    const std::uintptr_t address = _Unwind_GetIP(context);
    way.past_runtime |= runtime.holds(address);
    if (way.past_runtime && (library.holds(address) || program.holds(address)))
        way.owner = address;
    return way.owner != 0 || ++way.frames > UNWIND_DEPTH ? _URC_END_OF_STACK : _URC_NO_REASON;
}

_Unwind_Reason_Code step_along(_Unwind_Context *context, void *argument)
{
    walk &way = *static_cast<walk *>(argument);
    const std::uintptr_t address = _Unwind_GetIP(context);
    if (counts(address)) {
        way.key = (way.key ^ (address - (library.holds(address) ? library : program).from)) * 1099511628211u;
        ++way.deep;
    }
    return way.deep == PATH_DEPTH || ++way.frames > UNWIND_DEPTH ? _URC_END_OF_STACK : _URC_NO_REASON;
}

walk unwind(_Unwind_Trace_Fn step)
{
    walk way;
    inside = true;
    _Unwind_Backtrace(step, &way);
    inside = false;
    return way;
}

// The address that an allocation is charged to; 0: neither the library's nor, where that counts, the program's.
std::uintptr_t owner_of(const void *caller)
{
    const auto address = reinterpret_cast<std::uintptr_t>(caller);
    if (counts(address))
        return address;
    if (!runtime.holds(address))
        return 0;
    const walk way = unwind(step_to_owner);
    return counts(way.owner) ? way.owner : 0;
}

void note_path(std::uint64_t number)
{
    const std::uint64_t key = unwind(step_along).key;
    const std::scoped_lock held(lock);
    std::size_t at = key % PATHS_MAX;
    for (std::size_t tries = 0; paths[at] != 0 && paths[at] != key && tries < PATHS_MAX; ++tries)
        at = (at + 1) % PATHS_MAX;
    if (paths[at] != 0)
        return;
    paths[at] = key;
    report("path %llu %llx\n", static_cast<unsigned long long>(number), static_cast<unsigned long long>(key));
}

// Start and end.

int find_ranges(dl_phdr_info *object, std::size_t, void *)
{
    const char *const name = object->dlpi_name;
    range *const found = *name == '\0'                                    ? &program
                         : std::strstr(name, "libzuv_objects") != nullptr ? &library
                         : std::strstr(name, "libstdc++") != nullptr      ? &runtime
                                                                          : nullptr;
    for (int i = 0; found && i < object->dlpi_phnum; ++i)
        if (object->dlpi_phdr[i].p_type == PT_LOAD && (object->dlpi_phdr[i].p_flags & PF_X) != 0)
            *found = {object->dlpi_addr + object->dlpi_phdr[i].p_vaddr,
                      object->dlpi_addr + object->dlpi_phdr[i].p_vaddr + object->dlpi_phdr[i].p_memsz};
    return 0;
}

_Unwind_Reason_Code print_frame(_Unwind_Context *context, void *argument)
{
    int &frames = *static_cast<int *>(argument);
    char text[256];
    const std::uintptr_t address = _Unwind_GetIP(context);
    if (frames > 1) // past this handler and what called it
        report(" %s", site(address, text));
    return ++frames < 14 ? _URC_NO_REASON : _URC_END_OF_STACK;
}

void on_crash(int signal)
{
    inside = true;
    report("crash %d", signal);
    int frames = 0;
    _Unwind_Backtrace(print_frame, &frames);
    report("\n");
    _exit(98); // not by the signal: a test that waits for it would take a core file's time
}

const char *variable(const char *name)
{
    const char *const text = std::getenv(name);
    return text ? text : "";
}

__attribute__((constructor)) void start()
{
    const char *const file = variable("ZUV_TORTURE_REPORT");
    if (*file == '\0' || std::strcmp(program_invocation_short_name, variable("ZUV_TORTURE_PROGRAM")) != 0)
        return;
    report_file = open(file, O_WRONLY | O_APPEND | O_CREAT | O_CLOEXEC, 0600);
    if (report_file < 0)
        _exit(99);
    dl_iterate_phdr(find_ranges, nullptr);
    program_too = std::strcmp(program_invocation_short_name, "zuv-service") == 0;
    wants_paths = *variable("ZUV_TORTURE_PATHS") != '\0';
    refused_number = std::strtoull(variable("ZUV_TORTURE_NTH"), nullptr, 10);
    for (const int signal : {SIGSEGV, SIGBUS, SIGFPE, SIGILL, SIGABRT})
        std::signal(signal, on_crash);
    armed = true;
}

__attribute__((destructor)) void end()
{
    if (!armed)
        return;
    armed = false;
    live_block *const last = std::partition(std::begin(blocks), std::end(blocks),
                                            [](const live_block &b) { return b.caller != 0; });
    std::sort(blocks, last, [](const live_block &a, const live_block &b) { return a.caller < b.caller; });
    for (const live_block *first = blocks, *next = first; first != last; first = next) {
        char text[256];
        while (next != last && next->caller == first->caller)
            ++next;
        report("leaked %td %s\n", next - first, site(first->caller, text));
    }
    report("asked %llu\n", static_cast<unsigned long long>(asked.load()));
}

std::size_t home(const void *block)
{
    return (reinterpret_cast<std::uintptr_t>(block) >> 4) * 2654435761u % BLOCKS_MAX;
}

} // namespace

bool refuses(const void *caller)
{
    if (!armed || inside)
        return false;
    const std::uintptr_t owner = owner_of(caller);
    if (owner == 0)
        return false;
    const std::uint64_t number = ++asked;
    if (wants_paths && number <= LOOKED_AT)
        note_path(number);
    if (number != refused_number)
        return false;
    char text[256];
    report("refused %s\n", site(owner, text));
    errno = ENOMEM;
    return true;
}

void *given(void *block, const void *caller)
{
    const std::uintptr_t owner = armed && !inside && block ? owner_of(caller) : 0;
    if (owner == 0)
        return block;
    const std::scoped_lock held(lock);
    std::size_t at = home(block);
    for (std::size_t tries = 0; blocks[at].block && blocks[at].caller && tries < BLOCKS_MAX; ++tries)
        at = (at + 1) % BLOCKS_MAX;
    blocks[at] = {block, owner};
    return block;
}

void taken_back(void *block)
{
    if (!armed || inside || !block)
        return;
    const std::scoped_lock held(lock);
    for (std::size_t at = home(block), tries = 0; blocks[at].block && tries < BLOCKS_MAX;
         at = (at + 1) % BLOCKS_MAX, ++tries)
        if (blocks[at].block == block && blocks[at].caller) {
            blocks[at].caller = 0; // the search for others goes on past it
            return;
        }
}

} // namespace torture

// What the library asks of C++ comes by malloc's name too, but then from the runtime.

void *operator new(std::size_t size) // the other forms end here, too
{
    const void *const caller = __builtin_return_address(0);
    void *const block = torture::refuses(caller) ? nullptr : std::malloc(size ? size : 1);
    if (!block)
        throw std::bad_alloc();
    return torture::given(block, caller);
}
void operator delete(void *block) noexcept
{
    std::free(block);
}
void operator delete(void *block, std::size_t) noexcept
{
    std::free(block);
}
#endif
