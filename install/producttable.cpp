#include "install/producttable.h"

#include "install/ilist.h"
#include "install/installedprod.h"

#include <cstdio>
#include <cstdlib>
#include <cstring>

namespace {

constexpr uint32_t kClientBits = 0x0080 | 0x0100;

// clang-format off
constexpr KxliProductRow kCurrentRows[] = {
    {"PROD_HALDOR_PRIME", "hpe", "{6E1C2A40-9F3B-4D21-8A10-5B2C7D0E9A01}", "KXL Server Haldor Prime Edition", 0x0001,
     "HALDOR_PRIME_EDITION", KXLI_CATEGORY_SERVER, 4, 1, 1, 0x0001 | kClientBits, "kxlhpe.msi",
     "{6E1C2A40-9F3B-4D21-8A20-5B2C7D0E9A01}", "{6E1C2A41-9F3B-4D21-8A10-5B2C7D0E9A01}",
     "{6E1C2A41-9F3B-4D21-8A20-5B2C7D0E9A01}", "", ""},
    {"PROD_HALDOR", "hde", "{6E1C2A42-9F3B-4D21-8A10-5B2C7D0E9A01}", "KXL Server Haldor Edition", 0x0002,
     "HALDOR_EDITION", KXLI_CATEGORY_SERVER, 4, 1, 2, 0x0002 | kClientBits, "kxlhde.msi",
     "{6E1C2A42-9F3B-4D21-8A20-5B2C7D0E9A01}", "", "", "", ""},
    {"PROD_VESTRA", "vst", "{6E1C2A43-9F3B-4D21-8A10-5B2C7D0E9A01}", "KXL Vestra Server", 0x0004,
     "VESTRA_SERVER", KXLI_CATEGORY_SERVER, 3, 1, 3, 0x0004 | kClientBits, "kxlvst.msi",
     "{6E1C2A43-9F3B-4D21-8A20-5B2C7D0E9A01}", "", "", "", ""},
    {"PROD_MERIDA", "mer", "{6E1C2A44-9F3B-4D21-8A10-5B2C7D0E9A01}", "KXL Server Merida Edition", 0x0008,
     "MERIDA_EDITION", KXLI_CATEGORY_SERVER, 3, 1, 4, 0x0008 | kClientBits, "kxlmer.msi",
     "{6E1C2A44-9F3B-4D21-8A20-5B2C7D0E9A01}", "", "", "", ""},
    {"PROD_TALVEN", "tlv", "{6E1C2A45-9F3B-4D21-8A10-5B2C7D0E9A01}", "KXL Server Talven Edition", 0x0010,
     "TALVEN_EDITION", KXLI_CATEGORY_SERVER, 3, 1, 5, 0x0010 | kClientBits, "kxltlv.msi",
     "{6E1C2A45-9F3B-4D21-8A20-5B2C7D0E9A01}", "", "", "", ""},
    {"PROD_SOLENT", "sol", "{6E1C2A46-9F3B-4D21-8A10-5B2C7D0E9A01}", "KXL Server Solent Edition", 0x0020,
     "SOLENT_EDITION", KXLI_CATEGORY_SERVER, 3, 1, 6, 0x0020 | kClientBits, "kxlsol.msi",
     "{6E1C2A46-9F3B-4D21-8A20-5B2C7D0E9A01}", "", "", "", ""},
    {"PROD_CONNECT", "con", "{6E1C2A47-9F3B-4D21-8A10-5B2C7D0E9A01}", "KXL Connect Server", 0x0040,
     "CONNECT_SERVER", KXLI_CATEGORY_CONNECT, -1, 0, 7, 0x0040, "kxlcon.msi",
     "{6E1C2A47-9F3B-4D21-8A20-5B2C7D0E9A01}", "", "", "", ""},
    {"PROD_RUNTIME", "rtc", "{6E1C2A48-9F3B-4D21-8A10-5B2C7D0E9A01}", "KXL Runtime Client", 0x0080,
     "RUNTIME_CLIENT", KXLI_CATEGORY_CLIENT, -1, 0, 8, 0x0080, "kxlrtc.msi",
     "{6E1C2A48-9F3B-4D21-8A20-5B2C7D0E9A01}", "", "", "", ""},
    {"PROD_CLIENT", "cli", "{6E1C2A49-9F3B-4D21-8A10-5B2C7D0E9A01}", "KXL Client", 0x0100,
     "CLIENT", KXLI_CATEGORY_CLIENT, -1, 0, 9, 0x0100, "kxlcli.msi",
     "{6E1C2A49-9F3B-4D21-8A20-5B2C7D0E9A01}", "", "", "", ""},
    {"PROD_ZELQUOR", "zqc", "{6E1C2A4A-9F3B-4D21-8A10-5B2C7D0E9A01}", "KXL Zelquor Client", 0x0200,
     "ZELQUOR_CLIENT", KXLI_CATEGORY_CLIENT, -1, 0, 10, 0x0200, "kxlzqc.msi",
     "{6E1C2A4A-9F3B-4D21-8A20-5B2C7D0E9A01}", "", "", "", ""},
    {"PROD_ORRIN", "orx", "{6E1C2A4B-9F3B-4D21-8A10-5B2C7D0E9A01}", "KXL Orrin Extender", 0x0400,
     "ORRIN_EXTENDER", KXLI_CATEGORY_ADDON, -1, 0, 11, 0x0400, "kxlorx.msi",
     "{6E1C2A4B-9F3B-4D21-8A20-5B2C7D0E9A01}", "", "", "", ""},
    {"PROD_CONTENT", "cnx", "{6E1C2A4C-9F3B-4D21-8A10-5B2C7D0E9A01}", "KXL Content Extender", 0x0800,
     "CONTENT_EXTENDER", KXLI_CATEGORY_ADDON, -1, 0, 12, 0x0800, "kxlcnx.msi",
     "{6E1C2A4C-9F3B-4D21-8A20-5B2C7D0E9A01}", "", "", "", ""},
    {"PROD_BRASK", "brk", "{6E1C2A4D-9F3B-4D21-8A10-5B2C7D0E9A01}", "KXL Brask Monitor", 0x1000,
     "BRASK_MONITOR", KXLI_CATEGORY_ADDON, -1, 0, 13, 0x1000, "kxlbrk.msi",
     "{6E1C2A4D-9F3B-4D21-8A20-5B2C7D0E9A01}", "", "", "", ""},
    {"PROD_DOCS", "doc", "{6E1C2A4E-9F3B-4D21-8A10-5B2C7D0E9A01}", "KXL Documentation", 0x2000,
     "DOCUMENTATION", KXLI_CATEGORY_DOC, -1, 0, 14, 0x2000, "kxldoc.msi",
     "{6E1C2A4E-9F3B-4D21-8A20-5B2C7D0E9A01}", "", "", "", ""},
    {"PROD_ODBC", "odb", "{6E1C2A4F-9F3B-4D21-8A10-5B2C7D0E9A01}", "KXL ODBC Driver", 0x4000,
     "ODBC_DRIVER", KXLI_CATEGORY_DOC, -1, 0, 15, 0x4000, "kxlodb.msi",
     "{6E1C2A4F-9F3B-4D21-8A20-5B2C7D0E9A01}", "", "", "", ""},
};

#define KXLI_V8_ROW(key, code, guid, name, bit, edition, category, flag) \
  {key, code, guid, name, bit, edition, category, 0, flag, 0, bit, nullptr, "", "", "", "", ""}

constexpr KxliProductRow kV8Rows[] = {
    KXLI_V8_ROW("PROD_KESSEL", "srv", "{3A7D0C10-52E4-4B6F-9C01-1D2E3F405001}", "KXL Server Edition", 0x00000001, "KESSEL_SERVER", KXLI_CATEGORY_SERVER, 1),
    KXLI_V8_ROW("PROD_KESSEL", "kse", "{3A7D0C10-52E4-4B6F-9C01-1D2E3F405002}", "KXL Kessel Server Edition", 0x00000002, "KESSEL_SERVER", KXLI_CATEGORY_SERVER, 1),
    KXLI_V8_ROW("PROD_KESSEL", "kwe", "{3A7D0C10-52E4-4B6F-9C01-1D2E3F405003}", "KXL Kessel Workgroup Edition", 0x00000004, "KESSEL_WORKGROUP", KXLI_CATEGORY_SERVER, 1),
    KXLI_V8_ROW("PROD_TAMBRO", "tpd", "{3A7D0C10-52E4-4B6F-9C01-1D2E3F405004}", "KXL Tambro Developer Edition", 0x00000008, "TAMBRO_DEVELOPER", KXLI_CATEGORY_SERVER, 1),
    KXLI_V8_ROW("PROD_TAMBRO", "tud", "{3A7D0C10-52E4-4B6F-9C01-1D2E3F405005}", "KXL Tambro Universal Developer Edition", 0x00000010, "TAMBRO_UNIVERSAL", KXLI_CATEGORY_SERVER, 1),
    KXLI_V8_ROW("PROD_PERSONAL", "per", "{3A7D0C10-52E4-4B6F-9C01-1D2E3F405006}", "KXL Personal Edition", 0x00000020, "PERSONAL_EDITION", KXLI_CATEGORY_SERVER, 1),
    KXLI_V8_ROW("PROD_CONNECT", "cpe", "{3A7D0C10-52E4-4B6F-9C01-1D2E3F405007}", "KXL Connect Personal Edition", 0x00000040, "CONNECT_PERSONAL", KXLI_CATEGORY_CONNECT, 0),
    KXLI_V8_ROW("PROD_CONNECTSRV", "cse", "{3A7D0C10-52E4-4B6F-9C01-1D2E3F405008}", "KXL Connect Server Edition", 0x00000080, "CONNECT_SERVER", KXLI_CATEGORY_CONNECT, 0),
    KXLI_V8_ROW("PROD_RUNTIME", "rtc", "{3A7D0C10-52E4-4B6F-9C01-1D2E3F405009}", "KXL Runtime Client", 0x00000100, "RUNTIME_CLIENT", KXLI_CATEGORY_CLIENT, 0),
    KXLI_V8_ROW("PROD_ADMIN", "adc", "{3A7D0C10-52E4-4B6F-9C01-1D2E3F40500A}", "KXL Administration Client", 0x00000200, "ADMIN_CLIENT", KXLI_CATEGORY_CLIENT, 0),
    KXLI_V8_ROW("PROD_DEVCLIENT", "dvc", "{3A7D0C10-52E4-4B6F-9C01-1D2E3F40500B}", "KXL Development Client", 0x00000400, "DEVELOPMENT_CLIENT", KXLI_CATEGORY_CLIENT, 0),
    KXLI_V8_ROW("PROD_DOCS", "txt", "{3A7D0C10-52E4-4B6F-9C01-1D2E3F40500C}", "KXL Documentation", 0x00000800, "DOCUMENTATION", KXLI_CATEGORY_DOC, 0),
    KXLI_V8_ROW("PROD_ORRIN", "orx", "{3A7D0C10-52E4-4B6F-9C01-1D2E3F40500D}", "KXL Orrin Extender", 0x00001000, "ORRIN_EXTENDER", KXLI_CATEGORY_ADDON, 0),
    KXLI_V8_ROW("PROD_CORVEL", "cvx", "{3A7D0C10-52E4-4B6F-9C01-1D2E3F40500E}", "KXL Corvel Extender", 0x00002000, "CORVEL_EXTENDER", KXLI_CATEGORY_ADDON, 0),
    KXLI_V8_ROW("PROD_DUNMAR", "dmx", "{3A7D0C10-52E4-4B6F-9C01-1D2E3F40500F}", "KXL Dunmar Extender", 0x00004000, "DUNMAR_EXTENDER", KXLI_CATEGORY_ADDON, 0),
    KXLI_V8_ROW("PROD_ELVAY", "elx", "{3A7D0C10-52E4-4B6F-9C01-1D2E3F405010}", "KXL Elvay Extender", 0x00008000, "ELVAY_EXTENDER", KXLI_CATEGORY_ADDON, 0),
    KXLI_V8_ROW("PROD_FENNIC", "fnx", "{3A7D0C10-52E4-4B6F-9C01-1D2E3F405011}", "KXL Fennic Extender", 0x00010000, "FENNIC_EXTENDER", KXLI_CATEGORY_ADDON, 0),
    KXLI_V8_ROW("PROD_GARROW", "gwm", "{3A7D0C10-52E4-4B6F-9C01-1D2E3F405012}", "KXL Garrow Manager", 0x00020000, "GARROW_MANAGER", KXLI_CATEGORY_ADDON, 0),
    KXLI_V8_ROW("PROD_BRASK", "brk", "{3A7D0C10-52E4-4B6F-9C01-1D2E3F405013}", "KXL Brask Monitor", 0x00040000, "BRASK_MONITOR", KXLI_CATEGORY_ADDON, 0),
    KXLI_V8_ROW("PROD_HESTLE", "hsl", "{3A7D0C10-52E4-4B6F-9C01-1D2E3F405014}", "KXL Hestle Link Manager", 0x00080000, "HESTLE_LINKS", KXLI_CATEGORY_ADDON, 0),
    KXLI_V8_ROW("PROD_ISLIN", "isc", "{3A7D0C10-52E4-4B6F-9C01-1D2E3F405015}", "KXL Islin Connect", 0x00100000, "ISLIN_CONNECT", KXLI_CATEGORY_CONNECT, 0),
    KXLI_V8_ROW("PROD_JORVA", "jdc", "{3A7D0C10-52E4-4B6F-9C01-1D2E3F405016}", "KXL Jorva Data Connect", 0x00200000, "JORVA_CONNECT", KXLI_CATEGORY_CONNECT, 0),
    KXLI_V8_ROW("PROD_KELTO", "klx", "{3A7D0C10-52E4-4B6F-9C01-1D2E3F405017}", "KXL Kelto Extender", 0x00400000, "KELTO_EXTENDER", KXLI_CATEGORY_ADDON, 0),
    KXLI_V8_ROW("PROD_LUMEN", "lmn", "{3A7D0C10-52E4-4B6F-9C01-1D2E3F405018}", "KXL Lumen Miner", 0x00800000, "LUMEN_MINER", KXLI_CATEGORY_ADDON, 0),
    KXLI_V8_ROW("PROD_ODBC", "odb", "{3A7D0C10-52E4-4B6F-9C01-1D2E3F405019}", "KXL ODBC Driver", 0x01000000, "ODBC_DRIVER", KXLI_CATEGORY_DOC, 0),
    KXLI_V8_ROW("PROD_JAVADRV", "jdb", "{3A7D0C10-52E4-4B6F-9C01-1D2E3F40501A}", "KXL Java Driver", 0x02000000, "JAVA_DRIVER", KXLI_CATEGORY_DOC, 0),
    KXLI_V8_ROW("PROD_MARROW", "mrk", "{3A7D0C10-52E4-4B6F-9C01-1D2E3F40501B}", "KXL Marrow Starter Kit", 0x04000000, "MARROW_KIT", KXLI_CATEGORY_ADDON, 0),
};
// clang-format on

#undef KXLI_V8_ROW

static_assert(sizeof kCurrentRows / sizeof kCurrentRows[0] == 15);
static_assert(sizeof kV8Rows / sizeof kV8Rows[0] == 27);

} // namespace

KxliProductTable kxliProductTable(bool v8) {
  if (v8)
    return {kV8Rows, sizeof kV8Rows / sizeof kV8Rows[0]};
  return {kCurrentRows, sizeof kCurrentRows / sizeof kCurrentRows[0]};
}

const KxliProductRow *kxliFindProductRow(const char *code, bool v8) {
  if (code == nullptr)
    return nullptr;
  KxliProductTable table = kxliProductTable(v8);
  for (size_t i = 0; i < table.count; ++i) {
    if (kxliSameName(table.rows[i].code, code))
      return &table.rows[i];
  }
  return nullptr;
}

bool kxliDerivedCode(const char *code, uint32_t k, char *out, size_t size) {
  const char *dash[4] = {};
  const char *at = code;
  for (int i = 0; i < 4; ++i) {
    dash[i] = std::strchr(at, '-');
    if (dash[i] == nullptr)
      return false;
    at = dash[i] + 1;
  }
  if (std::strchr(dash[3] + 1, '-') != nullptr || dash[3] - dash[2] - 1 != 4)
    return false;
  char group[5] = {};
  std::memcpy(group, dash[2] + 1, 4);
  char *end = nullptr;
  unsigned long value = std::strtoul(group, &end, 16);
  if (end != group + 4)
    return false;
  int prefix = static_cast<int>(dash[2] + 1 - code);
  return std::snprintf(out, size, "%.*s%04X%s", prefix, code, static_cast<unsigned>((value + k) & 0xFFFF),
                       dash[3]) < static_cast<int>(size);
}
