// The device ID key names, once in search form (with the colon the key search
// expects) and once in dictionary form (without it). Each list is grouped by
// field: command set, manufacturer, model, serial number, compatible IDs. The
// order of a list is not a search order; every operation keeps its own.
#pragma once

#include <array>
#include <string_view>

namespace PMDeviceIDSearchKeys {

inline constexpr std::string_view kCommandSet = "COMMAND SET:";
inline constexpr std::string_view kCMD = "CMD:";
inline constexpr std::string_view kUSBCommandSet = "usb_COMMAND SET:";
inline constexpr std::string_view kUSBCMD = "usb_CMD:";
inline constexpr std::string_view kPDL = "pdl:";

inline constexpr std::string_view kManufacturer = "MANUFACTURER:";
inline constexpr std::string_view kMFG = "MFG:";
inline constexpr std::string_view kUSBManufacturer = "usb_MANUFACTURER:";
inline constexpr std::string_view kUSBMFG = "usb_MFG:";
inline constexpr std::string_view kUSBG = "usb_G:";

inline constexpr std::string_view kModel = "MODEL:";
inline constexpr std::string_view kMDL = "MDL:";
inline constexpr std::string_view kUSBModel = "usb_MODEL:";
inline constexpr std::string_view kUSBMDL = "usb_MDL:";
inline constexpr std::string_view kTY = "ty:";

inline constexpr std::string_view kSERN = "SERN:";
inline constexpr std::string_view kSRN = "SRN:";
inline constexpr std::string_view kSN = "SN:";
inline constexpr std::string_view kUSBSERN = "usb_SERN:";
inline constexpr std::string_view kUSBSRN = "usb_SRN:";
inline constexpr std::string_view kUSBSN = "usb_SN:";

// "COMPATIBLITY" is the spelling printers and drivers use; keep it.
inline constexpr std::string_view kCompatiblityID = "COMPATIBLITY ID:";
inline constexpr std::string_view kCID = "CID:";
inline constexpr std::string_view kUSBCompatiblityID = "usb_COMPATIBLITY ID:";
inline constexpr std::string_view kUSBCID = "usb_CID:";

inline constexpr std::array<std::string_view, 25> kAll = {
    kCommandSet,
    kCMD,
    kUSBCommandSet,
    kUSBCMD,
    kPDL,
    kManufacturer,
    kMFG,
    kUSBManufacturer,
    kUSBMFG,
    kUSBG,
    kModel,
    kMDL,
    kUSBModel,
    kUSBMDL,
    kTY,
    kSERN,
    kSRN,
    kSN,
    kUSBSERN,
    kUSBSRN,
    kUSBSN,
    kCompatiblityID,
    kCID,
    kUSBCompatiblityID,
    kUSBCID,
};

// Not part of the field lists above: the network-discovery product entry and
// the description that the display name falls back to.
inline constexpr std::string_view kProduct = "product:";
inline constexpr std::string_view kDES = "DES:";
inline constexpr std::string_view kDescription = "DESCRIPTION:";

}  // namespace PMDeviceIDSearchKeys

namespace PMDeviceIDDictionaryKeys {

inline constexpr std::string_view kCommandSet = "COMMAND SET";
inline constexpr std::string_view kCMD = "CMD";
inline constexpr std::string_view kUSBCommandSet = "usb_COMMAND SET";
inline constexpr std::string_view kUSBCMD = "usb_CMD";
inline constexpr std::string_view kPDL = "pdl";

inline constexpr std::string_view kManufacturer = "MANUFACTURER";
inline constexpr std::string_view kMFG = "MFG";
inline constexpr std::string_view kUSBManufacturer = "usb_MANUFACTURER";
inline constexpr std::string_view kUSBMFG = "usb_MFG";
inline constexpr std::string_view kUSBG = "usb_G";

inline constexpr std::string_view kModel = "MODEL";
inline constexpr std::string_view kMDL = "MDL";
inline constexpr std::string_view kUSBModel = "usb_MODEL";
inline constexpr std::string_view kUSBMDL = "usb_MDL";
inline constexpr std::string_view kTY = "ty";

inline constexpr std::string_view kSERN = "SERN";
inline constexpr std::string_view kSRN = "SRN";
inline constexpr std::string_view kSN = "SN";
inline constexpr std::string_view kUSBSERN = "usb_SERN";
inline constexpr std::string_view kUSBSRN = "usb_SRN";
inline constexpr std::string_view kUSBSN = "usb_SN";

inline constexpr std::string_view kCompatiblityID = "COMPATIBLITY ID";
inline constexpr std::string_view kCID = "CID";
inline constexpr std::string_view kUSBCompatiblityID = "usb_COMPATIBLITY ID";
inline constexpr std::string_view kUSBCID = "usb_CID";

inline constexpr std::array<std::string_view, 25> kAll = {
    kCommandSet,
    kCMD,
    kUSBCommandSet,
    kUSBCMD,
    kPDL,
    kManufacturer,
    kMFG,
    kUSBManufacturer,
    kUSBMFG,
    kUSBG,
    kModel,
    kMDL,
    kUSBModel,
    kUSBMDL,
    kTY,
    kSERN,
    kSRN,
    kSN,
    kUSBSERN,
    kUSBSRN,
    kUSBSN,
    kCompatiblityID,
    kCID,
    kUSBCompatiblityID,
    kUSBCID,
};

inline constexpr std::string_view kProduct = "product";

}  // namespace PMDeviceIDDictionaryKeys
