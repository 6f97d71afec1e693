// store.cpp - see store.h.
#include "store.h"

#include <fcntl.h>
#include <sqlite3.h>
#include <sys/stat.h>
#include <unistd.h>

namespace service {

namespace {

constexpr int BUSY_MS = 10000; // wait for another process that holds the database

constexpr const char *SETUP = "PRAGMA journal_mode=WAL;"
                              "PRAGMA synchronous=FULL;" // an acknowledged change survives the loss of power
                              "CREATE TABLE IF NOT EXISTS document("
                              " port TEXT NOT NULL,"
                              " uri TEXT NOT NULL,"
                              " state INTEGER NOT NULL," // code of the port's enumeration
                              " xml BLOB NOT NULL,"
                              " created TEXT NOT NULL,"
                              " changed TEXT NOT NULL,"
                              " PRIMARY KEY(port, uri));"
                              "CREATE TABLE IF NOT EXISTS data_file("
                              " name TEXT PRIMARY KEY,"
                              " size INTEGER NOT NULL);";

constexpr const char *NOW = "strftime('%Y-%m-%dT%H:%M:%SZ','now')";

void bind_text(sqlite3_stmt *prepared, int place, std::string_view text)
{
    sqlite3_bind_text64(prepared, place, text.empty() ? "" : text.data(), text.size(), SQLITE_STATIC,
                        SQLITE_UTF8);
}

void bind_blob(sqlite3_stmt *prepared, int place, std::string_view bytes)
{
    sqlite3_bind_blob64(prepared, place, bytes.empty() ? "" : bytes.data(), bytes.size(), SQLITE_STATIC);
}

// Documents hold names and credentials: a new database is its owner's alone whatever the umask is, and so are
// the files that SQLite keeps next to it, which take its mode. One that exists keeps its mode.
void create_private(const std::string &path)
{
    const int descriptor = open(path.c_str(), O_RDWR | O_CREAT | O_EXCL | O_CLOEXEC, S_IRUSR | S_IWUSR);
    if (descriptor < 0)
        return; // it exists, or can't be created, which SQLite reports
    fchmod(descriptor, S_IRUSR | S_IWUSR);
    close(descriptor);
}

// Resets the statement for its next use, whatever happens.
struct rewinder {
    sqlite3_stmt *prepared;
    ~rewinder()
    {
        sqlite3_reset(prepared);
        sqlite3_clear_bindings(prepared);
    }
};

} // namespace

void store::closer::operator()(sqlite3 *handle) const
{
    sqlite3_close(handle);
}

void store::closer::operator()(sqlite3_stmt *prepared) const
{
    sqlite3_finalize(prepared);
}

store::store(database &place) : place_(place)
{
    create_private(place.path);
    sqlite3 *handle = nullptr;
    const int opened =
        sqlite3_open_v2(place.path.c_str(), &handle,
                        SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE | SQLITE_OPEN_NOMUTEX, nullptr);
    handle_.reset(handle);
    if (opened != SQLITE_OK)
        throw store_error("cannot open " + place.path + ": " +
                          (handle ? sqlite3_errmsg(handle) : "out of memory"));
    sqlite3_busy_timeout(handle, BUSY_MS);
    {
        const std::lock_guard<std::mutex> turn(place.writers);
        execute(SETUP);
    }
    const std::string now = NOW;
    find_ = prepare("SELECT xml FROM document WHERE port=?1 AND uri=?2");
    each_ = prepare("SELECT xml FROM document WHERE port=?1 ORDER BY uri");
    data_size_ = prepare("SELECT size FROM data_file WHERE name=?1");
    expect_data_ = prepare("INSERT INTO data_file VALUES(?1, 0)");
    note_data_ = prepare("UPDATE data_file SET size=?2 WHERE name=?1");
    forget_data_ = prepare("DELETE FROM data_file WHERE name=?1");
    insert_ = prepare(("INSERT INTO document VALUES(?1,?2,?3,?4," + now + "," + now + ")").c_str());
    replace_ = prepare(
        ("UPDATE document SET state=?3, xml=?4, changed=" + now + " WHERE port=?1 AND uri=?2").c_str());
    remove_ = prepare("DELETE FROM document WHERE port=?1 AND uri=?2");
    begin_ = prepare("BEGIN IMMEDIATE");
    commit_ = prepare("COMMIT");
    rollback_ = prepare("ROLLBACK");
}

store::~store() = default;

void store::fail() const
{
    throw store_error(std::string("database: ") + sqlite3_errmsg(handle_.get()));
}

store::statement store::prepare(const char *sql)
{
    sqlite3_stmt *made = nullptr;
    if (sqlite3_prepare_v3(handle_.get(), sql, -1, SQLITE_PREPARE_PERSISTENT, &made, nullptr) != SQLITE_OK)
        fail();
    return statement(made);
}

void store::execute(const char *sql)
{
    if (sqlite3_exec(handle_.get(), sql, nullptr, nullptr, nullptr) != SQLITE_OK)
        fail();
}

void store::run(const statement &prepared)
{
    const rewinder after{prepared.get()};
    if (sqlite3_step(prepared.get()) != SQLITE_DONE)
        fail();
}

namespace {

std::string_view blob_of(sqlite3_stmt *row)
{
    const auto *const bytes = static_cast<const char *>(sqlite3_column_blob(row, 0));
    return {bytes, bytes == nullptr ? 0 : static_cast<std::size_t>(sqlite3_column_bytes(row, 0))};
}

} // namespace

bool store::step_to_row(const statement &prepared)
{
    const int found = sqlite3_step(prepared.get());
    if (found != SQLITE_DONE && found != SQLITE_ROW)
        fail();
    return found == SQLITE_ROW;
}

std::optional<std::string> store::find(std::string_view port, std::string_view uri)
{
    const rewinder after{find_.get()};
    bind_text(find_.get(), 1, port);
    bind_text(find_.get(), 2, uri);
    return step_to_row(find_) ? std::optional(std::string(blob_of(find_.get()))) : std::nullopt;
}

std::optional<std::uint64_t> store::data_size(std::string_view name)
{
    const rewinder after{data_size_.get()};
    bind_text(data_size_.get(), 1, name);
    if (!step_to_row(data_size_))
        return std::nullopt;
    return static_cast<std::uint64_t>(sqlite3_column_int64(data_size_.get(), 0));
}

void store::each(std::string_view port, const std::function<bool(std::string_view xml)> &use)
{
    const rewinder after{each_.get()};
    bind_text(each_.get(), 1, port);
    int found;
    while ((found = sqlite3_step(each_.get())) == SQLITE_ROW)
        if (!use(blob_of(each_.get())))
            return;
    if (found != SQLITE_DONE)
        fail();
}

void store::expect_data(std::string_view name)
{
    bind_text(expect_data_.get(), 1, name);
    run(expect_data_);
}

bool store::note_data(std::string_view name, std::uint64_t size)
{
    bind_text(note_data_.get(), 1, name);
    sqlite3_bind_int64(note_data_.get(), 2, static_cast<sqlite3_int64>(size));
    run(note_data_);
    return sqlite3_changes(handle_.get()) != 0;
}

void store::forget_data(std::string_view name)
{
    bind_text(forget_data_.get(), 1, name);
    run(forget_data_);
}

void store::insert(std::string_view port, std::string_view uri, int state, std::string_view xml)
{
    bind_text(insert_.get(), 1, port);
    bind_text(insert_.get(), 2, uri);
    sqlite3_bind_int(insert_.get(), 3, state);
    bind_blob(insert_.get(), 4, xml);
    run(insert_);
}

void store::replace(std::string_view port, std::string_view uri, int state, std::string_view xml)
{
    bind_text(replace_.get(), 1, port);
    bind_text(replace_.get(), 2, uri);
    sqlite3_bind_int(replace_.get(), 3, state);
    bind_blob(replace_.get(), 4, xml);
    run(replace_);
}

void store::remove(std::string_view port, std::string_view uri)
{
    bind_text(remove_.get(), 1, port);
    bind_text(remove_.get(), 2, uri);
    run(remove_);
}

bool store::is_empty()
{
    return !step_to_row(prepare("SELECT 1 FROM document LIMIT 1"));
}

std::vector<std::string> store::clear()
{
    std::vector<std::string> names;
    writing transaction(*this);
    const statement each = prepare("SELECT name FROM data_file");
    while (step_to_row(each))
        names.emplace_back(blob_of(each.get()));
    execute("DELETE FROM document; DELETE FROM data_file");
    transaction.commit();
    return names;
}

store::writing::writing(store &target) : target_(target), turn_(target.place_.writers)
{
    target_.run(target_.begin_);
}

store::writing::~writing()
{
    if (!open_)
        return;
    const rewinder after{target_.rollback_.get()};
    sqlite3_step(target_.rollback_.get()); // a failure means that SQLite has rolled back already
}

void store::writing::commit()
{
    target_.run(target_.commit_);
    open_ = false;
}

} // namespace service
