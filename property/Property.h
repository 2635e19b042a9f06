// The daemon's system properties: a fixed table of names and defaults, and typed accessors for the
// rows that the tool uses. Writes are confirmed by reading the value back. Values are not cached.
#pragma once

#include <mutex>
#include <string>
#include <vector>

struct PropertyItem {
    std::string alias;         // name of the row, unique in the table
    std::string key;           // name of the system property
    std::string defaultValue;  // used if the property is empty; empty if there is no default
};

class Property {
  public:
    Property();
    Property(const Property&) = delete;
    Property& operator=(const Property&) = delete;

    // Returns the row with this alias, or the first row if the alias is unknown. Owned by this
    // object.
    PropertyItem& GetItem(std::string alias);

    // Reads the property `key` into `out` and returns the length of the value. Reads an empty
    // property once more after 100 us. If it is still empty, stores the default in the property and
    // in `out` and returns its length + 1, or returns 0 if there is no default.
    int Get(std::string key, std::string& out, std::string defaultValue);

    // Writes `value` until it reads back, at most six times. A failure shows only in the log.
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

    // String getters. Return what Get() returns with the row's default.
    int GetThplogEnable(std::string& out);
    int GetServiceEnable(std::string& out);
    int GetDaeAlive(std::string& out);
    int GetRebootTimes(std::string& out);
    int GetBinder(std::string& out);
    int GetUpdateFW(std::string& out);
    int GetPermissive(std::string& out);

    // Reads the user type, a decimal number. Returns what Get() returns. Leaves `type` unchanged if
    // the value does not begin with a number or the number does not fit in an int.
    int GetUserType(int& type);

    // Flag getters. Return true if the value is exactly "true" or "1". GetRebootTimes() therefore
    // returns true only if the restart count is exactly 1.
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

    std::mutex mMutex;    // locked by the accessors, but not by Get(), Set() and GetItem()
    char mBuf[128] = {};  // last value read
    std::string mValue;   // last string read by a flag getter or GetUserType
    std::vector<PropertyItem> mItems;
};
