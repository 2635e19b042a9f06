// The daemon's system properties: a fixed table of named rows, reads with defaults, writes that are
// confirmed by reading them back, and a typed accessor for every row the tool uses.
//
// An object is meant for one caller's scope; it caches no value, so every read sees the device.
#pragma once

#include <mutex>
#include <string>
#include <vector>

struct PropertyItem {
    std::string alias;         // name the accessors use, unique in the table
    std::string key;           // system property
    std::string defaultValue;  // of an empty property; empty when the row has none
};

class Property {
  public:
    Property();
    Property(const Property&) = delete;
    Property& operator=(const Property&) = delete;

    // The row of this alias, or the table's first row when there is none. The object owns it.
    PropertyItem& GetItem(std::string alias);

    // Reads the property `key` into `out` and returns the length of its value. An empty property is
    // read once more after a pause; if it stays empty, `out` gets the default, which is also stored
    // in the property, and the result is the default's length + 1 (0 when there is no default).
    int Get(std::string key, std::string& out, std::string defaultValue);

    // Writes `value` until the property reads back as it, at most six times. Of a rejected write
    // only its log lines remain.
    void Set(std::string key, std::string value);

    // Setters. A flag is stored as "true" or "false", a number in decimal.
    void SetDebugOn(bool on);
    void SetRawData(bool on);
    void SetThplogEnable(bool on);
    void SetPersistVerDae(bool on);
    void SetServiceEnable(int value);
    void SetBootFlag(bool on);
    void SetVerDae(bool on);
    void SetAfeLog(bool on);
    void SetPermissive(bool on);

    // String getters: `out` and the result are those of Get() with the row's default.
    int GetThplogEnable(std::string& out);
    int GetServiceEnable(std::string& out);
    int GetDaeAlive(std::string& out);
    int GetRebootTimes(std::string& out);
    int GetBinder(std::string& out);
    int GetUpdateFW(std::string& out);
    int GetPermissive(std::string& out);

    // The user type as a decimal number; the result is that of Get(). `type` is left untouched when
    // the property is empty, does not begin with a number or holds one outside the range of int.
    int GetUserType(int& type);

    // Flag getters: whether the value is exactly "true" or "1". Thus GetRebootTimes() is whether
    // the count reads "1", not how many restarts there were.
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

    std::mutex mMutex;    // held by each accessor; Get, Set and GetItem never take it
    char mBuf[128] = {};  // last value read
    std::string mValue;   // last string read by a flag getter or GetUserType
    std::vector<PropertyItem> mItems;
};
