#pragma once

#include <cstdint>
#include <memory>
#include <string>

#include "core/Driver.h"
#include "lang/VbArray.h"

namespace maroset {

class Procedure;
namespace platform {
class Recordset;
}

// Tags kept on disk, one database file per node: "C:\NUVDiskIO\" + node name + ".mdb", with
// one table TagValues (ID auto-increment, TagName, TagValue as text, primary index IDIndex).
// startup creates the folder and the file when they are missing (a blank file, left by a
// creation that an older version did not finish, counts as missing); every other operation opens
// the file afresh, runs "select * from TagValues  where TagName like '<name>'" with the
// engine's like (wildcards in a name match other rows), and releases the file at its end.
//
// WriteItem stores the value's text and reports the written value itself back before it
// returns; the row is on the disk by then. ReadItem reports the stored text. Neither returns
// the value: results are always 0.
//
// The tag table: parallel arrays of names and handles indexed from 0. Slot 0 is never used and
// one empty slot (empty name, handle 0) always follows the last tag; a handle is looked up from
// slot 1 on, so handle 0 finds that empty slot, and an unknown handle fails with Subscript out
// of range (9). A name registered twice takes two slots; the first one wins.
class ClsDriverDiskTag final : public Driver {
  public:
    const char* className() const override { return "ClsDriverDiskTag"; }

    void shutdown() override;
    // Sets up the tag table and the file; the first argument is ignored, TopicName is the node
    // name.
    void startup(std::string ServerName, std::string TopicName) override;
    void PostMessage(int32_t& lError) override;
    void IsActive(bool NewValue) override;
    // Leaves the tag registered.
    void RemoveItem(int16_t ClientHandle) override;
    std::string GetErrorString(int32_t& lErrCode) override;
    // 3021 No current record when the tag's row is missing; nothing is reported then.
    int32_t WriteItem(int32_t ClientHandle, const Variant& data) override;
    // Registers the tag and creates its row with the value 0 when it has none.
    bool AddItem(const std::string& TagName, int16_t ClientHandle) override;
    bool AddItems(int16_t NumItems, VbArray<std::string>& TagNames,
                  VbArray<int32_t>& ClientHandles) override;
    // Reports the stored text; reports nothing when the row is missing.
    int32_t ReadItem(int32_t ClientHandle) override;
    int32_t ReadAllItems() override;
    // Creates the database file with its table and index (3204 when it exists). The file
    // appears only when whole: a process killed meanwhile leaves no file at the path.
    void CreateDISKIODB();
    int32_t WriteArray(int32_t ClientHandle, VbArray<Variant>& data) override;

    // The folder of the tag files on drive C:.
    static constexpr const char* Folder = "C:\\NUVDiskIO\\";

    // The file of this node on drive C:, as set by startup ("" before).
    const std::string& DatabasePath() const { return path_; }
    // The tag table, for hosts and tests that look at it.
    const VbArray<std::string>& TagNames() const { return tagNames_; }
    const VbArray<int32_t>& ClientHandles() const { return clientHandles_; }

  private:
    // The slot of the first tag with this handle (9 past the last slot).
    int32_t slotOf(int32_t handle) const;
    // The tag name of a handle and the row query for a name, each step a statement of the
    // calling operation's procedure, so the trap retries or skips it on its own.
    std::string tagName(Procedure& proc, int32_t handle) const;
    std::unique_ptr<platform::Recordset> queryRow(Procedure& proc, const std::string& name) const;

    VbArray<std::string> tagNames_;
    VbArray<int32_t> clientHandles_;
    std::string path_;
};

}  // namespace maroset
