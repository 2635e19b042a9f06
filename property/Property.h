// The daemon's system properties: a fixed table of named rows, reads with defaults, writes
// confirmed by reading back, and a typed accessor for every row that the tool uses.
//
// An object lives in the scope of one operation. It caches no values: every read asks the device.
#pragma once

#include <mutex>
#include <string>
#include <vector>

struct PropertyItem {
    std::string alias;         // the accessors' name for the row, unique in the table
    std::string key;           // system property
    std::string defaultValue;  // for an empty property; empty if the row has none
};

class Property {
  public:
    Property();
    Property(const Property&) = delete;
    Property& operator=(const Property&) = delete;

    // The row with this alias, or the table's first row if the alias is unknown. Owned by the
    // object.
    PropertyItem& GetItem(std::string alias);

    // Reads the property `key` into `out` and returns the length of the value. An empty property is
    // read once more after a pause. If it is still empty, the default is stored in the property and
    // in `out`, and the default's length + 1 is returned, or 0 if there is no default.
    int Get(std::string key, std::string& out, std::string defaultValue);

    // Writes `value` up to six times, until it reads back. A failure shows only in the log.
    void Set(std::string key, std::string value);

    // Setters. Flags are stored as "true" or "false", numbers in decimal.
    void SetDebugOn(bool on);
    void SetRawData(bool on);
    void SetThplogEnable(bool on);
    void SetPersistVerDae(bool on);
    void SetServiceEnable(int value);
    void SetBootFlag(bool on);
    void SetVerDae(bool on);
    void SetAfeLog(bool on);
    void SetPermissive(bool on);

    // String getters: Get() with the row's default.
    int GetThplogEnable(std::string& out);
    int GetServiceEnable(std::string& out);
    int GetDaeAlive(std::string& out);
    int GetRebootTimes(std::string& out);
    int GetBinder(std::string& out);
    int GetUpdateFW(std::string& out);
    int GetPermissive(std::string& out);

    // The user type, a decimal number. Returns what Get() returns. Leaves `type` alone if the value
    // does not begin with a number or the number does not fit in an int.
    int GetUserType(int& type);

    // Flag getters: whether the value is exactly "true" or "1". GetRebootTimes() therefore tells
    // whether the count is "1", not how many restarts there were.
    bool GetServiceEnable();
    bool GetDaeAlive();
    bool GetRebootTimes();
    bool GetBinder();
    bool GetUpdateFW();
    bool GetPermissive();

  private:
    void SetText(const char* alias, const std::string& text);
    void SetFlag(const char* alias, bool on);
    int GetText(const char* alias, std::string& out);
    bool GetFlag(const char* alias);

    std::mutex mMutex;    // held by the accessors; Get, Set and GetItem do not take it
    char mBuf[128] = {};  // last value read
    std::string mValue;   // last string read by a flag getter or GetUserType
    std::vector<PropertyItem> mItems;
};
