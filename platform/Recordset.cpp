#include "platform/Recordset.h"

#include <cmath>

#include "lang/Conversions.h"
#include "platform/SqliteConnection.h"

namespace maroset::platform {
namespace {

[[noreturn]] void NoCurrentRecord() {
    throw VbError(err::NoCurrentRecord, "No current record.");
}

[[noreturn]] void WithoutEdit() {
    throw VbError(dberr::UpdateWithoutAddNewOrEdit,
                  "Update or CancelUpdate without AddNew or Edit.");
}

// Binds a value read from the file back as it was stored, to find its row again.
void BindStored(sqlite3_stmt* s, int index, const Variant& v, uint8_t storage) {
    switch (storage) {
        case SQLITE_INTEGER:
            sqlite3_bind_int64(s, index,
                               v.type() == VarType::Long
                                   ? v.lng()
                                   : static_cast<sqlite3_int64>(std::llround(v.dbl())));
            break;
        case SQLITE_FLOAT:
            sqlite3_bind_double(s, index, v.dbl());
            break;
        case SQLITE_TEXT:
            sqlite3_bind_text(s, index, v.string().data(), static_cast<int>(v.string().size()),
                              SQLITE_TRANSIENT);
            break;
        case SQLITE_BLOB:
            sqlite3_bind_blob(s, index, v.string().data(), static_cast<int>(v.string().size()),
                              SQLITE_TRANSIENT);
            break;
        default:
            sqlite3_bind_null(s, index);
            break;
    }
}

}  // namespace

Recordset::Recordset(std::shared_ptr<SqliteConnection> connection)
    : connection_(std::move(connection)) {}

void Recordset::load(sqlite3_stmt* s, const std::string& sql) {
    const int count = sqlite3_column_count(s);
    // Rows can be changed when every field is a column of one table of this file, each column
    // once (a join of a table with itself is not).
    bool oneTable = true;
    for (int i = 0; i < count; ++i) {
        columns_.emplace_back(sqlite3_column_name(s, i));
        if (!oneTable) continue;
        const char* db = sqlite3_column_database_name(s, i);
        const char* table = sqlite3_column_table_name(s, i);
        const char* origin = sqlite3_column_origin_name(s, i);
        if (!db || !table || !origin || std::string_view(db) != "main" ||
            (i > 0 && table_ != table)) {
            oneTable = false;
            continue;
        }
        table_ = table;
        for (const auto& seen : origins_)
            if (NamesEqual(seen, origin)) oneTable = false;
        origins_.emplace_back(origin);
        // SQLite's column affinity rules, from the declared type.
        std::string type = sqlite3_column_decltype(s, i) ? sqlite3_column_decltype(s, i) : "";
        for (char& c : type)
            if (c >= 'a' && c <= 'z') c = static_cast<char>(c - 32);
        auto has = [&](const char* part) { return type.find(part) != std::string::npos; };
        Affinity affinity = Affinity::Numeric;
        if (has("INT"))
            affinity = Affinity::Numeric;
        else if (has("CHAR") || has("CLOB") || has("TEXT"))
            affinity = Affinity::Text;
        else if (type.empty())
            affinity = Affinity::None;
        else if (has("BLOB"))
            affinity = Affinity::Blob;
        affinities_.push_back(affinity);
    }
    if (!oneTable || count == 0) {
        table_.clear();
        origins_.clear();
        affinities_.clear();
    }
    while (connection_->Step(s, sql)) {
        Row row;
        for (int i = 0; i < count; ++i) {
            row.storage.push_back(static_cast<uint8_t>(sqlite3_column_type(s, i)));
            row.values.push_back(ReadColumn(s, i));
        }
        rows_.push_back(std::move(row));
    }
}

bool Recordset::target() const {
    if (targetKnown_) return updatable_;
    targetKnown_ = true;
    if (table_.empty()) return false;
    // A table without rowids cannot be changed through a recordset.
    sqlite3_stmt* probe = nullptr;
    const std::string probeSql = "SELECT rowid FROM " + QuoteIdentifier(table_) + " LIMIT 0";
    const bool hasRowid = sqlite3_prepare_v2(connection_->handle(), probeSql.c_str(), -1, &probe,
                                             nullptr) == SQLITE_OK;
    sqlite3_finalize(probe);
    if (!hasRowid) return false;
    // The table's INTEGER PRIMARY KEY is its rowid: a field that is that column carries it.
    // PRAGMA table_info is the cheapest way to the keys: rows are edited one at a time, each
    // time on a connection of its own.
    const std::string sql = "PRAGMA table_info(" + QuoteIdentifier(table_) + ")";
    auto info = connection_->Prepare(sql);
    int keys = 0;
    std::string name, type;
    while (connection_->Step(info.get(), sql)) {
        const int pk = sqlite3_column_int(info.get(), 5);
        if (pk > 0) ++keys;
        if (pk != 1) continue;
        name = reinterpret_cast<const char*>(sqlite3_column_text(info.get(), 1));
        const auto* declared = sqlite3_column_text(info.get(), 2);
        type = declared ? reinterpret_cast<const char*>(declared) : "";
    }
    if (keys == 1 && NamesEqual(type, "INTEGER")) {
        rowidName_ = name;
        for (size_t i = 0; i < origins_.size(); ++i)
            if (NamesEqual(origins_[i], name)) rowidField_ = static_cast<int>(i);
    }
    updatable_ = true;
    return true;
}

bool Recordset::Updatable() const {
    return target();
}

Recordset::~Recordset() = default;

void Recordset::MoveFirst() {
    if (rows_.empty()) NoCurrentRecord();
    mode_ = Mode::None;
    pending_.clear();
    current_ = 0;
}

void Recordset::MoveNext() {
    if (eof()) NoCurrentRecord();
    mode_ = Mode::None;
    pending_.clear();
    ++current_;
}

size_t Recordset::column(const std::string& name) const {
    for (size_t i = 0; i < columns_.size(); ++i)
        if (NamesEqual(columns_[i], name)) return i;
    throw VbError(err::ItemNotFound, "Item not found in this collection.");
}

const Recordset::Row& Recordset::currentRow() const {
    if (eof()) NoCurrentRecord();
    return rows_[current_];
}

Variant Recordset::Fields(const std::string& name) const {
    const size_t i = column(name);
    if (mode_ != Mode::None)
        for (const auto& [field, value] : pending_)
            if (field == i) return value;
    if (mode_ == Mode::Add) return Variant::Null();
    return currentRow().values[i];
}

void Recordset::AddNew() {
    if (!Updatable())
        throw VbError(dberr::ReadOnly, "Cannot update. Database or object is read-only.");
    mode_ = Mode::Add;
    pending_.clear();
}

void Recordset::Edit() {
    if (!Updatable())
        throw VbError(dberr::ReadOnly, "Cannot update. Database or object is read-only.");
    currentRow();
    mode_ = Mode::Edit;
    pending_.clear();
}

void Recordset::setField(const std::string& name, const Variant& value) {
    const size_t i = column(name);
    if (mode_ == Mode::None) WithoutEdit();
    // An object field takes its default value; an array cannot be stored.
    Variant v = value.isObject() ? value.object()->defaultValue() : value;
    if (v.isArray()) throw VbError(err::TypeMismatch, ErrorDescription(err::TypeMismatch));
    for (auto& [field, old] : pending_)
        if (field == i) {
            old = std::move(v);
            return;
        }
    pending_.emplace_back(i, std::move(v));
}

int64_t Recordset::locate(Row& row) const {
    if (row.hasRowid) return row.rowid;
    if (rowidField_ >= 0 && row.storage[static_cast<size_t>(rowidField_)] == SQLITE_INTEGER) {
        const Variant& key = row.values[static_cast<size_t>(rowidField_)];
        row.rowid = key.type() == VarType::Long ? key.lng() : std::llround(key.dbl());
        row.hasRowid = true;
        return row.rowid;
    }
    // The query did not select the table's key: find the row by the values it was read with.
    // Rows that are alike in every selected field are interchangeable; the first one is taken.
    std::string sql =
        "SELECT " + QuoteIdentifier(rowidName_) + " FROM " + QuoteIdentifier(table_) + " WHERE ";
    for (size_t i = 0; i < origins_.size(); ++i) {
        if (i) sql += " AND ";
        sql += QuoteIdentifier(origins_[i]) + " IS ?" + std::to_string(i + 1);
    }
    sql += " LIMIT 1";
    auto s = connection_->Prepare(sql);
    for (size_t i = 0; i < origins_.size(); ++i)
        BindStored(s.get(), static_cast<int>(i + 1), row.values[i], row.storage[i]);
    if (!connection_->Step(s.get(), sql))
        throw VbError(dberr::RecordIsDeleted, "Record is deleted.");
    row.rowid = sqlite3_column_int64(s.get(), 0);
    row.hasRowid = true;
    return row.rowid;
}

void Recordset::refresh(Row& row) const {
    std::string sql = "SELECT ";
    for (size_t i = 0; i < origins_.size(); ++i)
        sql += (i ? ", " : "") + QuoteIdentifier(origins_[i]);
    sql += " FROM " + QuoteIdentifier(table_) + " WHERE " + QuoteIdentifier(rowidName_) + " = ?1";
    auto s = connection_->Prepare(sql);
    sqlite3_bind_int64(s.get(), 1, row.rowid);
    if (!connection_->Step(s.get(), sql)) return;
    row.values.clear();
    row.storage.clear();
    for (int i = 0; i < static_cast<int>(origins_.size()); ++i) {
        row.storage.push_back(static_cast<uint8_t>(sqlite3_column_type(s.get(), i)));
        row.values.push_back(ReadColumn(s.get(), i));
    }
}

void Recordset::Update() {
    if (mode_ == Mode::None) WithoutEdit();
    // Binds a value as the field's column keeps it: text fields take the value's text, number
    // fields numbers, binary fields bytes.
    auto bind = [](sqlite3_stmt* s, int index, const Variant& v, Affinity affinity) {
        if (v.isNull() || (v.isEmpty() && affinity != Affinity::Text))
            return sqlite3_bind_null(s, index);
        if (affinity == Affinity::Text) {
            const std::string text = CStr(v);
            return sqlite3_bind_text(s, index, text.data(), static_cast<int>(text.size()),
                                     SQLITE_TRANSIENT);
        }
        switch (v.type()) {
            case VarType::Integer:
            case VarType::Long:
                return sqlite3_bind_int64(s, index, CLng(v));
            case VarType::Boolean:
                return sqlite3_bind_int64(s, index, v.boolean() ? -1 : 0);
            case VarType::Single:
            case VarType::Double:
                return sqlite3_bind_double(s, index, CDbl(v));
            default:
                break;
        }
        const std::string& bytes = v.string();
        if (affinity == Affinity::Blob)
            return sqlite3_bind_blob(s, index, bytes.data(), static_cast<int>(bytes.size()),
                                     SQLITE_TRANSIENT);
        return sqlite3_bind_text(s, index, bytes.data(), static_cast<int>(bytes.size()),
                                 SQLITE_TRANSIENT);
    };

    std::string sql;
    if (mode_ == Mode::Edit) {
        Row& row = rows_[current_];
        const int64_t rowid = locate(row);
        if (!pending_.empty()) {
            sql = "UPDATE " + QuoteIdentifier(table_) + " SET ";
            for (size_t k = 0; k < pending_.size(); ++k)
                sql += (k ? ", " : "") + QuoteIdentifier(origins_[pending_[k].first]) + " = ?" +
                       std::to_string(k + 1);
            sql += " WHERE " + QuoteIdentifier(rowidName_) + " = ?" +
                   std::to_string(pending_.size() + 1);
            auto s = connection_->Prepare(sql);
            for (size_t k = 0; k < pending_.size(); ++k)
                bind(s.get(), static_cast<int>(k + 1), pending_[k].second,
                     affinities_[pending_[k].first]);
            sqlite3_bind_int64(s.get(), static_cast<int>(pending_.size() + 1), rowid);
            connection_->Step(s.get(), sql);
            if (sqlite3_changes(connection_->handle()) == 0)
                throw VbError(dberr::RecordIsDeleted, "Record is deleted.");
        }
        refresh(row);
    } else {
        if (pending_.empty()) {
            sql = "INSERT INTO " + QuoteIdentifier(table_) + " DEFAULT VALUES";
        } else {
            std::string values;
            sql = "INSERT INTO " + QuoteIdentifier(table_) + " (";
            for (size_t k = 0; k < pending_.size(); ++k) {
                sql += (k ? ", " : "") + QuoteIdentifier(origins_[pending_[k].first]);
                values += (k ? ", ?" : "?") + std::to_string(k + 1);
            }
            sql += ") VALUES (" + values + ")";
        }
        auto s = connection_->Prepare(sql);
        for (size_t k = 0; k < pending_.size(); ++k)
            bind(s.get(), static_cast<int>(k + 1), pending_[k].second,
                 affinities_[pending_[k].first]);
        connection_->Step(s.get(), sql);
        Row row;
        row.rowid = sqlite3_last_insert_rowid(connection_->handle());
        row.hasRowid = true;
        refresh(row);
        // The new record joins the end; the current record stays where it was, and a
        // recordset that was at its end stays there.
        const bool atEnd = eof();
        rows_.push_back(std::move(row));
        if (atEnd) current_ = rows_.size();
    }
    mode_ = Mode::None;
    pending_.clear();
}

}  // namespace maroset::platform
