#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "lang/Variant.h"

struct sqlite3_stmt;

namespace maroset::platform {

class SqliteConnection;

// The rows of one query, read when the query runs, with a current-record cursor as the
// system's recordsets have. Fields are found by name, case-insensitively; values come as the
// database delivers them: integers as Long (Double beyond 32 bits), reals as Double, text as
// String, NULL as Null, binary data as a String of its bytes.
//
// A recordset on the rows of one table can change it: Edit() then setField() and Update()
// rewrites the current row; AddNew() then setField() and Update() inserts one, which joins the
// end of the recordset while the current record stays where it was. Each Update() is written
// to the file, and synced, before it returns. A text field receives the text of the value
// (CStr); number fields receive numbers.
//
// The recordset keeps its connection alive, so it may outlive its Database.
class Recordset {
  public:
    ~Recordset();
    Recordset(const Recordset&) = delete;
    Recordset& operator=(const Recordset&) = delete;

    int32_t RecordCount() const { return static_cast<int32_t>(rows_.size()); }
    bool eof() const { return current_ >= rows_.size(); }
    bool bof() const { return rows_.empty() || current_ == npos_before_; }

    // 3021 No current record on an empty recordset.
    void MoveFirst();
    // 3021 No current record when already past the last record.
    void MoveNext();

    // Value of a field of the current record (3265 unknown field, 3021 no current record).
    // While a record is being added or edited, the value set for it.
    Variant Fields(const std::string& name) const;
    // The names of the fields, in query order.
    const std::vector<std::string>& FieldNames() const { return columns_; }
    // Whether Edit and AddNew can change the rows (a query on one table that has rowids).
    bool Updatable() const;

    // 3027 Cannot update when the rows do not come from one table.
    void AddNew();
    // 3021 No current record when there is none; 3027 as AddNew.
    void Edit();
    // Sets a field of the record being edited or added (3265 unknown field, 3020 without
    // Edit or AddNew first).
    void setField(const std::string& name, const Variant& value);
    // Writes the record being edited or added (3020 without Edit or AddNew first, 3167 when
    // the row has been deleted meanwhile).
    void Update();

  private:
    friend class Database;

    // One row as read: values, the storage class of each (to find the row again exactly) and
    // its rowid once known.
    struct Row {
        std::vector<Variant> values;
        std::vector<uint8_t> storage;
        int64_t rowid = 0;
        bool hasRowid = false;
    };
    enum class Affinity : uint8_t { Text, Numeric, Blob, None };

    explicit Recordset(std::shared_ptr<SqliteConnection> connection);
    // Reads the field names, where each field comes from, and every row of the statement.
    void load(sqlite3_stmt* statement, const std::string& sql);
    // Settles, on first need only, whether and how the rows can be changed; false when not.
    bool target() const;

    static constexpr size_t npos_before_ = static_cast<size_t>(-1);
    size_t column(const std::string& name) const;
    const Row& currentRow() const;
    int64_t locate(Row& row) const;
    void refresh(Row& row) const;

    std::shared_ptr<SqliteConnection> connection_;
    std::vector<std::string> columns_;
    std::vector<Row> rows_;
    size_t current_ = 0;

    // The table the rows come from ("" when they do not come from one table), each field's
    // column in it and the column's affinity. Which field (if any) is the table's INTEGER
    // PRIMARY KEY is looked up on the first change.
    std::string table_;
    std::vector<std::string> origins_;
    std::vector<Affinity> affinities_;
    mutable bool targetKnown_ = false;
    mutable bool updatable_ = false;
    mutable std::string rowidName_ = "rowid";
    mutable int rowidField_ = -1;

    enum class Mode { None, Edit, Add } mode_ = Mode::None;
    std::vector<std::pair<size_t, Variant>> pending_;
};

}  // namespace maroset::platform
