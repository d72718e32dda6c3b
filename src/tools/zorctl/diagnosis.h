// Finding out what an interrupted run left, and putting it right.
//
// The registry says where everything else is, so it is looked at first. Then the index, the backups
// and what is missing show which run was interrupted and how far it had come: an extraction goes
// back to the old files, a commit goes forward, and a removal is finished. Only backups that
// restoreTrusted() accepts are put back.
#pragma once

#include "install_registry.h"
#include "survey.h"

#include <functional>
#include <set>
#include <string>
#include <vector>

/// One thing to do.
struct Action {
    std::string code;
    std::string path; ///< what it is about
    std::function<bool()> carryOut;
    std::string outcome = "planned"; ///< then "done" or "failed"
};

/// What was found out about one installation.
class Diagnosis {
public:
    /// `home`: where a first installation was interrupted; empty: the usual place. `found` is what
    /// was surveyed; it is completed, and must outlive this.
    Diagnosis(Installation& found, std::string home);
    Diagnosis(const Diagnosis&) = delete; // the actions refer to it
    Diagnosis& operator=(const Diagnosis&) = delete;

    /// Does what is to be done; false if something failed.
    bool carryOut();

    [[nodiscard]] const std::vector<Action>& actions() const { return actions_; }
    [[nodiscard]] const std::vector<Problem>& advice() const { return advice_; }
    /// "installation", "registration", "upgrade", "removal" or empty.
    [[nodiscard]] const std::string& interrupted() const { return interrupted_; }
    [[nodiscard]] const std::string& home() const { return home_; }

private:
    void restoreRegistry();
    void readIndexOf(const std::string& home);
    std::vector<std::string> packageBackups(bool areTrusted = true) const;
    bool wasRegistered() const;
    void diagnoseDeployment();
    void goForward();
    void goBack();
    void restoreIndex(const std::set<std::string>& restored);
    void addPresent(const std::string& home, std::set<std::string>& files) const;
    void diagnoseUnregistered();
    bool isInterruptedRemoval() const;
    void diagnoseRemoval();
    void diagnoseRest();
    void recordType();
    void setModes();
    void deleteCache();
    void enableScanners();
    void deleteLater(const char* code, const std::string& path);
    void add(const char* code, const std::string& path, std::function<bool()> carryOut);
    void advise(const char* code, std::string text);

    Installation& found_;
    std::string home_;
    std::string index_;
    std::set<std::string> listed_;
    InstallRegistry stamp_;
    std::string interrupted_;
    std::vector<Action> actions_;
    std::vector<Problem> advice_;
};
