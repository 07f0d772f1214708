// The en_US catalog texts the scenarios expect, as the user sees them.
#pragma once

#include <string>

namespace kxltest {

inline const std::string kUsageText =
    "KXL1946E  Usage: KXLIUPGRADE [-q] [-a AuthType] [-p InstProfPath]\n"
    "                  [-u AccountName[,Password]] [-install] [-forcecn]\n"
    "                  [-j TEXT_SEARCH[,ServiceName][,PortNumber]] [-?] InstName\n"
    "\n"
    "  -q        quiet: print no final message\n"
    "  -a        authentication type of the upgraded instance: SERVER, CLIENT,\n"
    "            SERVER_ENCRYPT, DCS, DCE, DCS_ENCRYPT, DCE_SERVER_ENCRYPT,\n"
    "            KERBEROS or KERBEROS_SERVER_ENCRYPT\n"
    "  -p        instance profile path to hold the instance after the upgrade\n"
    "  -u        account the instance's services run under; required for a\n"
    "            partitioned instance\n"
    "  -install  run on behalf of an installer\n"
    "  -forcecn  on the machines of other partitions, register the instance under\n"
    "            this copy without moving their profiles\n"
    "  -j        configure the text search service of the instance\n"
    "  -?        show this text\n"
    "  InstName  the instance to upgrade to this copy\n";

inline std::string unknownInstanceText(const std::string &name) {
  return "KXL1951W  The instance \"" + name + "\" does not belong to any installed copy of the product.\n";
}
inline std::string alreadyUpgradedText(const std::string &name) {
  return "KXL1950W  The instance \"" + name + "\" already belongs to this copy. Nothing was changed.\n";
}
inline std::string badVersionText(const std::string &name) {
  return "KXL1949E  The instance \"" + name +
         "\" cannot be upgraded by this command: the versions of its copy and of this copy do not allow "
         "it.\n";
}
inline const std::string kSuccessText =
    "KXL1000I  KXLIUPGRADE finished: the instance now belongs to this copy.\n";
inline const std::string kReservedText =
    "KXL1139E  The instance is reserved by the global profile of its copy and cannot be upgraded.\n";
inline const std::string kAdminServerText =
    "KXL1954E  The administration server instance cannot be upgraded with this command.\n";
inline const std::string kActiveText =
    "KXL1953E  The instance is active. Stop all of its services and run the command again.\n";
inline const std::string kCheckWarningText = "KXL1225W  The database check reported warnings. The upgrade "
                                             "continues; review the check log after the upgrade.\n";
inline const std::string kOdbcText =
    "KXL1917W  ODBC data sources on this machine use the product's ODBC driver. "
    "Catalog them again so that they use the driver of this copy.\n";
inline const std::string kLegacyText =
    "KXL1392W  The command KXLIMIGR is deprecated. Use KXLIUPGRADE instead.\n";
inline std::string notAdminText(const std::string &user) {
  return "SQL1092N  The user \"" + user +
         "\" is not a local administrator of this machine and may not upgrade instances.\n";
}

} // namespace kxltest
