#include "link/operators.h"

#include <cstring>

#include "support/numbers.h"

namespace vqm {

namespace {

struct OperatorEntry {
    uint32_t code;  // mobile country code * 100 + mobile network code
    char name[32];
};

// The networks the card may report, in a fixed order: the first of two equal names wins
// when registering by name.
const OperatorEntry kOperators[] = {
    {20201, "COSMOTE"},    {20205, "PANAFON"},    {20210, "TELESTET"},    {20404, "LIBERTEL"},
    {20408, "NL KPN"},     {20412, "NL TELFORT"}, {20416, "Ben-NL"},      {20420, "Dutchtone"},
    {20601, "PROXIMUS"},   {20610, "Mobistar"},   {20620, "Orange"},      {20801, "Itineris"},
    {20810, "SFR"},        {20820, "F BOUYGTEL"}, {21303, "MOBILAND"},    {21401, "AIRTEL"},
    {21402, "MOVISTAR"},   {21403, "AMENA"},      {21407, "MOVISTAR"},    {21601, "PANNON GSM"},
    {21630, "WESTEL"},     {21670, "Vodafone"},   {21803, "ERONET"},      {21805, "GSM-MS1"},
    {21890, "GSMBIH"},     {21901, "HR-CRONET"},  {21910, "HR VIP"},      {22001, "MOBTEL"},
    {22201, "TIM"},        {22210, "OMNITEL"},    {22288, "WIND"},        {22298, "I BLU"},
    {22601, "Connex GSM"}, {22603, "Cosmorom"},   {22610, "dialog"},      {22801, "SWISS GSM"},
    {22802, "diAx Swiss"}, {22803, "Orange"},     {23001, "PAEGAS-CZ"},   {23002, "EUROTEL-CZ"},
    {23003, "OSKAR"},      {23101, "GLOBTEL"},    {23102, "EUROTEL-SK"},  {23201, "A1"},
    {23203, "A max."},     {23205, "one"},        {23207, "A tele.ring"}, {23410, "BT CELLNET"},
    {23415, "VODAFONE"},   {23430, "one2one"},    {23433, "Orange"},      {23450, "JT GSM"},
    {23455, "GSY-TEL"},    {23458, "PRONTO GSM"}, {23801, "TDK-MOBIL"},   {23802, "SONOFON"},
    {23820, "TELIA DK"},   {23830, "mobilix"},    {24001, "TELIA"},       {24007, "COMVIQ"},
    {24008, "EURO"},       {24201, "TELENOR"},    {24202, "NetCom GSM"},  {24403, "TELIA"},
    {24405, "RADIOLINJA"}, {24407, "TAVRO"},      {24409, "FINNET"},      {24491, "SONERA"},
    {24601, "OMNITEL"},    {24602, "BITE GSM"},   {24701, "LMT GSM"},     {24702, "B-COM"},
    {24801, "EMT GSM"},    {24802, "RLE"},        {24803, "Q GSM"},       {25001, "MTS"},
    {25002, "NWGSM"},      {25003, "NCC"},        {25004, "DTC"},         {25005, "SCS"},
    {25007, "ZAO SMARTS"}, {25012, "FEast"},      {25013, "Kuban-GSM"},   {25017, "Ermak RMS"},
    {25028, "EXTEL"},      {25039, "Uraltel"},    {25044, "NC-GSM"},      {25099, "Bee Line"},
    {25501, "UMC"},        {25502, "FLASH"},      {25503, "KYIVSTAR"},    {25505, "UA-GT"},
    {25701, "VELCOM"},     {25901, "VOXTEL"},     {26001, "Plus GSM"},    {26002, "ERA GSM"},
    {26003, "IDEA"},       {26201, "T-D1"},       {26202, "D2"},          {26203, "E-Plus"},
    {26207, "Interkom"},   {26601, "GIBTEL"},     {26801, "TELECEL"},     {26803, "OPTIMUS"},
    {26806, "TMN"},        {27001, "LUXGSM"},     {27077, "TANGO"},       {27201, "Eircell"},
    {27202, "DIGIFONE"},   {27203, "METEOR"},     {27401, "SIMINN"},      {27402, "TAL"},
    {27601, "AMC MOBIL"},  {27801, "VODA M"},     {28001, "CYTAGSM"},     {28201, "GEOCELL"},
    {28202, "MAGTI GSM"},  {28301, "ARMGSM"},     {28401, "M-TEL GSM"},   {28601, "TURKCELL"},
    {28602, "TELSIM GSM"}, {29340, "SI.MOBIL"},   {29341, "SI-GSM"},      {29401, "MOBIMAK"},
    {29505, "Mobilkom"},   {34001, "AMERIS"},     {40001, "ACELL"},       {40002, "BKCELL"},
    {40101, "K-MOBILE"},   {40102, "K'CELL"},     {40401, "ESSARH"},      {40405, "CELFORCE"},
    {40407, "TATA"},       {40408, "USHAFONE"},   {40410, "AirTel"},      {40411, "ESSAR"},
    {40412, "ESCOTEL"},    {40414, "MODICOM"},    {40415, "ESSARU"},      {40419, "ESCOTEL"},
    {40420, "Orange"},     {40421, "BPL MOBILE"}, {40422, "AT&T"},        {40423, "USHAFONE"},
    {40424, "AT&T"},       {40426, "USHAFONE"},   {40427, "BPL MOBILE"},  {40430, "COMMAND"},
    {40431, "MobileNet"},  {40432, "USHAFONE"},   {40440, "SKYCELL"},     {40441, "RPG"},
    {40442, "AIRCEL"},     {40443, "BPL MOBILE"}, {40444, "SPICE"},       {40445, "Airtel"},
    {40446, "BPL MOBILE"}, {40449, "Airtel"},     {40456, "ESCOTEL"},     {40460, "ESSARR"},
    {40470, "OASIS"},      {40478, "RPG MP"},     {41302, "DIALOG"},      {41303, "CELLTEL"},
    {41501, "Cellis"},     {41503, "LibanCell"},  {41601, "Fastlink"},    {41709, "MOBILE"},
    {41902, "MTCNet"},     {41903, "WATANIYA"},   {42001, "ALJAWWAL"},    {42007, "EAE"},
    {42202, "OMAN"},       {42402, "ETISALAT"},   {42501, "Orange"},      {42505, "JAWWAL"},
    {42601, "M.PLUS"},     {42701, "QATARNET"},   {43404, "DAEWOO-GSM"},  {43405, "COSCOM"},
    {43701, "BITEL"},      {45201, "Mobifone"},   {45202, "VINAPHONE"},   {45400, "C&W HKT"},
    {45404, "Orange"},     {45406, "HK SMC"},     {45410, "NEW WORLD"},   {45412, "PEOPLES"},
    {45416, "SUNDAY"},     {45418, "P-LINK"},     {45420, "Orange"},      {45422, "HK P PLUS"},
    {45501, "MAC-CTMGSM"}, {45601, "MOBITEL"},    {45602, "SAMART-GSM"},  {45701, "LAO GSM"},
    {46000, "CMCC"},       {46001, "UNICOM"},     {46601, "FarEasTone"},  {46606, "TUNTEX"},
    {46688, "KGT-ONLINE"}, {46692, "Chunghwa"},   {46693, "MOBITAI"},     {46697, "TWN GSM"},
    {46699, "TransAsia"},  {47001, "GP"},         {47002, "AKTEL"},       {47003, "ShebaWorld"},
    {47201, "DHIMOBILE"},  {50202, "BINARIANG"},  {50212, "maxis"},       {50213, "TMTOUCH"},
    {50216, "DiGi 1800"},  {50217, "ADAM"},       {50219, "MY CELCOM"},   {50501, "Telstra"},
    {50502, "YES OPTUS"},  {50503, "VODAFONE"},   {50508, "One.Tel"},     {51001, "SAT-C"},
    {51010, "TELKOMSEL"},  {51011, "EXCELCOM"},   {51501, "Islacom"},     {51502, "GLOBE"},
    {51503, "SMART Gold"}, {52001, "AIS GSM"},    {52010, "TH WCS"},      {52018, "WP-1800"},
    {52023, "Hello"},      {52501, "ST-GSM"},     {52502, "ST-GSM1800"},  {52503, "M1-GSM"},
    {52505, "STARHUB"},    {52811, "DSTCom"},     {53001, "VODAFONE"},    {54201, "VODAFONE"},
    {54601, "MOBILIS"},    {54720, "VINI"},       {60201, "MobiNiL"},     {60202, "CLICK"},
    {60301, "AMN"},        {60400, "MEDITEL"},    {60401, "IAM"},         {60502, "TT"},
    {60801, "Alize"},      {60802, "SENTEL"},     {61102, "LAGUI"},       {61203, "Ivoiris"},
    {61205, "TELECEL"},    {61501, "TOGO CELL"},  {61701, "CELLPLUS"},    {61710, "EMTEL"},
    {61801, "Omega"},      {62001, "SPACEFON"},   {62002, "GTGSM"},       {62100, "MTN NG"},
    {62401, "CAMNET"},     {62402, "Mobilis"},    {62501, "CVMOVEL"},     {62802, "Celtel"},
    {63301, "SEYCEL"},     {63310, "AIRTEL"},     {63401, "MobiTel"},     {63510, "Rwandacell"},
    {63601, "ETH-MTN"},    {63701, "BARAKAAT"},   {63903, "KenCell"},     {64001, "TRITEL"},
    {64003, "ZANTEL"},     {64101, "CELTEL"},     {64110, "MTN-UGANDA"},  {64202, "ANTARIS"},
    {64301, "mCel"},       {64710, "SFR RU"},     {64801, "NET*ONE"},     {64803, "TELECEL"},
    {64804, "ECONET"},     {65001, "CP 900"},     {65010, "Celtel"},      {65101, "VCL COMMS"},
    {65201, "MASCOM"},     {65310, "Swazi-MTN"},  {65501, "VodaCom"},     {65510, "MTN"},
    {73401, "INFONET"},    {73402, "DIGITEL"},    {74601, "ICMS"},
};
static_assert(sizeof kOperators / sizeof kOperators[0] == 287);

}  // namespace

int OperatorNameByCode(uint32_t code, char* name, size_t nameSize) {
    for (const OperatorEntry& entry : kOperators) {
        if (entry.code != code) continue;
        size_t length = std::strlen(entry.name);
        if (!name || length + 1 > nameSize) return 0;
        std::memcpy(name, entry.name, length + 1);
        return static_cast<int>(length);
    }
    return 0;
}

int32_t OperatorCodeByName(const char* name) {
    if (!name) return -1;
    const int length = static_cast<int>(std::strlen(name));
    for (const OperatorEntry& entry : kOperators) {
        const int entryLength = static_cast<int>(std::strlen(entry.name));
        if (entryLength == length && CompareText(0, entry.name, entryLength, name, length) == 0)
            return static_cast<int32_t>(entry.code);
    }
    return -1;
}

}  // namespace vqm
