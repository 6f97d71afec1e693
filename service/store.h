// store.h - the documents of all ports, kept in SQLite by port and name.
//
// Here: rows and transactions. Elsewhere: what a document's XML says (document.h).
//
// Always: a change is on the disk when `writing::commit` returns. One store serves one thread at a time; all
// stores of a database share its lock, so that writers wait for each other in turn. A failure of SQLite
// throws store_error.
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <mutex>
#include <optional>
#include <stdexcept>
#include <string>
#include <string_view>
#include <vector>

struct sqlite3;
struct sqlite3_stmt;

namespace service {

struct store_error : std::runtime_error {
    using std::runtime_error::runtime_error;
};

// Where the documents are; outlives its stores.
struct database {
    std::string path;
    std::string data_directory; // of the attachments' files
    std::mutex writers;         // held by the one transaction that may change something
};

class store {
public:
    // Opens the file; creates it, for its owner alone (mode 0600), and its tables unless they exist.
    explicit store(database &place);
    ~store();
    store(const store &) = delete;
    store &operator=(const store &) = delete;

    // XML of a document, or nothing.
    std::optional<std::string> find(std::string_view port, std::string_view uri);

    // Calls `use` with each document of a port, in the order of their names, until it returns false.
    void each(std::string_view port, const std::function<bool(std::string_view xml)> &use);

    // Bytes of an attachment's data, which are in a file of that name: nothing for a name that was never
    // issued, 0 until data has arrived.
    std::optional<std::uint64_t> data_size(std::string_view name);
    const std::string &data_directory() const { return place_.data_directory; }

    // A transaction: what was done since is undone unless it is committed.
    class writing {
    public:
        explicit writing(store &target);
        ~writing();
        writing(const writing &) = delete;
        writing &operator=(const writing &) = delete;
        void commit();

    private:
        store &target_;
        std::unique_lock<std::mutex> turn_;
        bool open_ = true;
    };

    // Changes, within a transaction. `state` is a code of the port's own enumeration of states.
    void insert(std::string_view port, std::string_view uri, int state, std::string_view xml);
    void replace(std::string_view port, std::string_view uri, int state, std::string_view xml);
    void remove(std::string_view port, std::string_view uri);
    void expect_data(std::string_view name);
    bool note_data(std::string_view name, std::uint64_t size); // false for an unknown name
    void forget_data(std::string_view name);

    bool is_empty(); // without documents
    // Forgets all documents and data, in a transaction of its own; the names of the data's files.
    std::vector<std::string> clear();

private:
    struct closer {
        void operator()(sqlite3 *handle) const;
        void operator()(sqlite3_stmt *statement) const;
    };
    using statement = std::unique_ptr<sqlite3_stmt, closer>;

    statement prepare(const char *sql);
    void run(const statement &prepared);
    bool step_to_row(const statement &prepared); // false if there is none
    void execute(const char *sql);
    [[noreturn]] void fail() const;

    database &place_;
    std::unique_ptr<sqlite3, closer> handle_;
    statement find_, each_, insert_, replace_, remove_, data_size_, expect_data_, note_data_, forget_data_,
        begin_, commit_, rollback_;
};

} // namespace service
