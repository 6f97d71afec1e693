// file_host.cpp - a host that sends a file to the service with a message, and fetches it back. The file may
// be of any size: its bytes go through callbacks, and never lie in memory as a whole.
//
// Usage: file_host [--mtom | --mime | --dime] [--chunked] SERVICE FILE COPY, SERVICE being
// "http://HOST:PORT".
//   --mtom, --mime, --dime  the form of the messages; MTOM unless given otherwise
//   --chunked               the size isn't known beforehand, as for data that is made while it is sent
// No trace file is written.
//
// Who owns what: the host its files, whose addresses are the handles of the attachments; the library hands
// them to the callbacks. What came with an answer, and the answer, are the proxy's until `destroy`.
#include <chrono>
#include <cinttypes>
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <memory>
#include <new>
#include <stdexcept>
#include <string>

#include <sys/stat.h>
#include <unistd.h>

#include <zuv_client_pro/StatusReportSoapBindingProxy.h>
#include <zuv_client_pro/protocol.h>
#include <zuv_client_pro/protocolStatusReport.h>
#include <zuv_client_pro/soap_attachment.h>
#include <zuv_client_pro/soap_error.h>
#include <zuv_client_pro/soap_log.h>

namespace {

constexpr char MEDIA_TYPE[] = "application/octet-stream";
constexpr double MEGABYTE = 1000000;

void expect(bool holds, const std::string &what)
{
    if (!holds)
        throw std::runtime_error("not so: " + what);
}

// ---------------------------------------------------------------------------------------------
// What is shown.

// A line of the process's memory in /proc, in kB: "VmRSS" now, "VmHWM" at most so far.
long memory_kb(const char *name)
{
    const std::unique_ptr<FILE, int (*)(FILE *)> status(std::fopen("/proc/self/status", "r"), std::fclose);
    char line[256];
    long kb = 0;
    while (status && std::fgets(line, sizeof line, status.get()) != nullptr)
        if (std::strncmp(line, name, std::strlen(name)) == 0)
            std::sscanf(line + std::strlen(name) + 1, "%ld", &kb);
    return kb;
}

// How far a transfer has come, on one line of the terminal, and its pace at the end.
class progress {
public:
    progress(const char *verb, std::uint64_t total) : verb_(verb), total_(total) {}

    void advance(std::size_t bytes)
    {
        done_ += bytes;
        const std::uint64_t percent = total_ == 0 ? 100 : done_ * 100 / total_;
        if (percent == shown_ || !isatty(STDOUT_FILENO))
            return;
        shown_ = percent;
        std::printf("\r    %-9s %3" PRIu64 " %%", verb_, percent);
        std::fflush(stdout);
    }

    void end() const
    {
        const std::chrono::duration<double> time = std::chrono::steady_clock::now() - start_;
        const double megabytes = static_cast<double>(done_) / MEGABYTE;
        std::printf("%s    %-9s %" PRIu64 " bytes in %.3f s, %.0f MB/s\n", isatty(STDOUT_FILENO) ? "\r" : "",
                    verb_, done_, time.count(), megabytes / time.count());
    }

private:
    const char *verb_;
    std::uint64_t total_, done_ = 0, shown_ = 101;
    std::chrono::steady_clock::time_point start_ = std::chrono::steady_clock::now();
};

// ---------------------------------------------------------------------------------------------
// Files, and the callbacks that read and write them. DIME and MIME ask for the same.

struct transfer {
    transfer(const char *path, const char *how, const char *verb, std::uint64_t size)
        : file(std::fopen(path, how), std::fclose), shown(verb, size)
    {
        if (!file)
            throw std::runtime_error(std::string("can't open ") + path);
        std::setvbuf(file.get(), nullptr, _IONBF, 0); // the library hands over large pieces
    }
    std::unique_ptr<FILE, int (*)(FILE *)> file;
    progress shown;
};

// The one file that a message may bring; null outside of a call that expects it.
struct host {
    transfer *expected = nullptr;
};

void *give_handle(void *handle)
{
    return handle; // that of soap_mime_attach or soap_dime_attach
}

std::size_t read_file(soap *, void *handle, char *buffer, std::size_t length)
{
    auto &source = *static_cast<transfer *>(handle);
    const std::size_t count = std::fread(buffer, 1, length, source.file.get());
    source.shown.advance(count);
    return count;
}

// The library keeps the bytes of unexpected parts in memory, which suits small parts.
void *take_expected(soap *ctx)
{
    transfer *const expected = static_cast<host *>(ctx->user)->expected;
    return expected != nullptr ? expected : soap_attachment_in_memory(ctx);
}

int write_file(soap *, void *handle, const char *data, std::size_t length)
{
    auto &target = *static_cast<transfer *>(handle);
    if (std::fwrite(data, 1, length, target.file.get()) != length)
        return SOAP_USER_ERROR; // ends the call with this code
    target.shown.advance(length);
    return 0;
}

void set_callbacks(soap &ctx, host &self)
{
    ctx.user = &self;
    ctx.mime_read_open = [](soap *, void *handle, const char *, const char *, const char *) {
        return give_handle(handle);
    };
    ctx.dime_read_open = [](soap *, void *handle, const char *, const char *, const char *) {
        return give_handle(handle);
    };
    ctx.mime_read = ctx.dime_read = read_file;
    ctx.mime_write_open = [](soap *c, void *, const char *, const char *, const char *, int) {
        return take_expected(c);
    };
    ctx.dime_write_open = [](soap *c, const char *, const char *, const char *) { return take_expected(c); };
    ctx.mime_write = ctx.dime_write = write_file;
}

// ---------------------------------------------------------------------------------------------
// The form of the messages.

struct form {
    bool dime = false, mtom = true, chunked = false;

    std::uint32_t mode() const
    {
        return (mtom ? MODE_MTOM : 0) | (dime ? MODE_DIME : 0) | (chunked ? MODE_CHUNKED : 0);
    }

    // Each message, also one without a file: the service answers in the form that it was asked in.
    void start(soap *ctx) const
    {
        if (!dime)
            soap_mime_start(ctx, nullptr, nullptr);
    }

    // The XML refers to it by the id "cid:file". A stream of length 0 is one of unknown length, so an empty
    // file goes without one.
    void attach(soap *ctx, transfer &source, std::uint64_t file_size) const
    {
        char *const handle = file_size == 0 ? nullptr : reinterpret_cast<char *>(&source);
        const std::uint64_t size = chunked ? 0 : file_size;
        const int error =
            dime ? soap_dime_attach(ctx, handle, size, MEDIA_TYPE, "file", 0, nullptr)
                 : soap_mime_attach(ctx, handle, size, MIME_BINARY, MEDIA_TYPE, "<file>", nullptr, nullptr);
        if (error != 0)
            throw std::bad_alloc();
    }
};

// ---------------------------------------------------------------------------------------------
// The host.

class file_keeper {
public:
    file_keeper(const std::string &service, const form &f)
        : form_(f), endpoint_(service + "/zuv/v1.0/services/StatusReport"),
          proxy_(static_cast<int>(MODE_KEEP_ALIVE | MODE_UTF_STRINGS),
                 static_cast<int>(MODE_KEEP_ALIVE | MODE_UTF_STRINGS | f.mode()))
    {
        proxy_.endpoint = endpoint_.c_str();
        soap_log_set_sent(&proxy_, nullptr); // a trace would hold the file, twice
        soap_log_set_received(&proxy_, nullptr);
        set_callbacks(proxy_, host_);
        header_.targetURI = &document_;
    }

    void hand_in(const char *path, std::uint64_t size)
    {
        std::string reference = "cid:file", size_text = std::to_string(size);
        protocol__Attachment attachment;
        attachment.dataHandler = &reference;
        attachment.size = &size_text;
        protocolStatusReport__StatusReportContent report;
        report.attachment = {&attachment};
        transfer source(path, "rb", "sent", size);
        form_.start(&proxy_);
        form_.attach(&proxy_, source, size);
        __protocolStatusReport__createResponse response;
        demand("create", proxy_.create(&report, response));
        source.shown.end();
        expect(response.result->thisURI.size() == 1, "the report has a name");
        document_ = response.result->thisURI.front();
        std::printf("    kept with %s\n", document_.c_str());
        proxy_.destroy();
    }

    void fetch(const char *path, std::uint64_t size)
    {
        transfer target(path, "wb", "received", size);
        host_.expected = &target;
        form_.start(&proxy_);
        proxy_.soap_header(&header_);
        _protocolStatusReport__getRequest request;
        __protocolStatusReport__getResponse response;
        demand("get", proxy_.get(&request, response));
        host_.expected = nullptr;
        target.shown.end();
        const auto &attachments = response.result->attachment;
        expect(attachments.size() == 1 && attachments[0]->dataHandler != nullptr,
               "the report names its file");
        const soap_attachment *const part = find(*attachments[0]->dataHandler);
        expect(part != nullptr && part->content == reinterpret_cast<char *>(&target) && part->size == size,
               "what came is that file, whole");
        proxy_.destroy();
    }

    void remove()
    {
        protocolStatusReport__StatusReportContent report;
        __protocolStatusReport__removeResponse response;
        form_.start(&proxy_);
        proxy_.soap_header(&header_);
        demand("remove", proxy_.remove(&report, response));
        proxy_.destroy();
    }

private:
    void demand(const char *call, int error)
    {
        if (error == 0)
            return;
        proxy_.soap_print_fault(stderr);
        throw std::runtime_error(std::string(call) + " failed with error " + std::to_string(error));
    }

    // What came with the last answer under a reference.
    const soap_attachment *find(const std::string &reference)
    {
        const soap_attachment *part = form_.dime ? proxy_.dime.list : proxy_.mime.list;
        while (part != nullptr && soap_cid_compare(&proxy_, reference.c_str(), part->id) != 0)
            part = part->next;
        return part;
    }

    form form_;
    std::string endpoint_; // borrowed by the proxy
    host host_;
    StatusReportSoapBindingProxy proxy_;
    protocol__Header header_; // names the document
    std::string document_;
};

std::uint64_t size_of(const char *path)
{
    struct stat about = {};
    if (stat(path, &about) != 0 || !S_ISREG(about.st_mode))
        throw std::runtime_error(std::string("not a file: ") + path);
    return static_cast<std::uint64_t>(about.st_size);
}

void keep_and_fetch(const std::string &service, const form &f, const char *path, const char *copy)
{
    const std::uint64_t size = size_of(path);
    file_keeper keeper(service, f);
    const long idle = memory_kb("VmRSS");
    keeper.hand_in(path, size);
    keeper.fetch(copy, size);
    keeper.remove();
    std::printf("    memory    %ld kB idle, at most %ld kB more\n", idle, memory_kb("VmHWM") - idle);
}

} // namespace

int main(int argc, char **argv)
{
    form f;
    int at = 1;
    for (; at < argc && std::strncmp(argv[at], "--", 2) == 0; ++at) {
        const std::string option = argv[at];
        if (option == "--chunked") {
            f.chunked = true;
        } else {
            f.dime = option == "--dime";
            f.mtom = option == "--mtom";
        }
    }
    if (argc - at != 3) {
        std::fprintf(stderr, "usage: file_host [--mtom | --mime | --dime] [--chunked] SERVICE FILE COPY\n");
        return 2;
    }
    try {
        keep_and_fetch(argv[at], f, argv[at + 1], argv[at + 2]);
        return 0;
    } catch (const std::exception &failure) {
        std::fprintf(stderr, "file_host: %s\n", failure.what());
        return 1;
    }
}
