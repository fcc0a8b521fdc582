#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "core/Variant.h"

struct sqlite3;

namespace maroset::platform {

// The rows of one query, read when the query runs, with a current-record cursor as the
// system's recordsets have. Fields are found by name, case-insensitively; values come as the
// database delivers them: integers as Long (Double beyond 32 bits), reals as Double, text as
// String, NULL as Null.
//
// A recordset on one table can change it: Edit() then setField() and Update() rewrites the
// current row; AddNew() then setField() and Update() inserts one. Each Update() is written to
// the file before it returns.
class Recordset {
public:
    Recordset(sqlite3* db, std::string table, std::vector<std::string> columns,
              std::vector<std::vector<Variant>> rows, std::vector<int64_t> rowids);

    int32_t RecordCount() const { return static_cast<int32_t>(rows_.size()); }
    bool eof() const { return current_ >= rows_.size(); }
    bool bof() const { return rows_.empty() || current_ == npos_before_; }

    // 3021 No current record on an empty recordset.
    void MoveFirst();
    void MoveNext();

    // Value of a field of the current record (3265 unknown field, 3021 no current record).
    Variant Fields(const std::string& name) const;

    void AddNew();
    // 3021 No current record when there is none.
    void Edit();
    // Sets a field of the record being edited or added (3265 unknown field).
    void setField(const std::string& name, const Variant& value);
    // Writes the record being edited or added.
    void Update();

private:
    static constexpr size_t npos_before_ = static_cast<size_t>(-1);
    size_t column(const std::string& name) const;

    sqlite3* db_;
    std::string table_;
    std::vector<std::string> columns_;
    std::vector<std::vector<Variant>> rows_;
    std::vector<int64_t> rowids_;
    size_t current_ = 0;
    enum class Mode { None, Edit, Add } mode_ = Mode::None;
    std::vector<std::pair<size_t, Variant>> pending_;
};

}  // namespace maroset::platform
