// Dispatch ids of the Quarn host's objects. The host's type library is not
// ours; these numbers are what its objects answer to.
#pragma once

#include <string_view>

#include "automation/object.h"

namespace kpx::hostid {

// Collections (1-based).
inline constexpr DispId kCount = 202;
inline constexpr DispId kGetAt = 203;

// Application.
inline constexpr DispId kCurrentModel = 209;
inline constexpr DispId kWriteErrorLog = 213;
inline constexpr DispId kApplicationPath = 233;
inline constexpr DispId kExecuteScript = 236;
inline constexpr DispId kAddInManager = 12544;
inline constexpr std::string_view kGetMainWnd = "GetMainWnd";

// Add-in manager.
inline constexpr DispId kAddIns = 12529;

// Add-in.
inline constexpr DispId kAddInName = 12540;
inline constexpr DispId kDeactivate = 12542;
inline constexpr DispId kActivate = 12543;
inline constexpr DispId kReadSetting = 12596;
inline constexpr DispId kWriteSetting = 12597;
inline constexpr DispId kAddContextMenuItem = 12684;
inline constexpr DispId kHelpFile = 12532;
inline constexpr DispId kInstallDirectory = 12535;
inline constexpr DispId kRegistryRoot = 12536;
inline constexpr std::string_view kEventHandler = "EventHandler";
inline constexpr std::string_view kMenuState = "MenuState";

// Model and elements.
inline constexpr DispId kGetSelectedItems = 12681;
inline constexpr DispId kGetPropertyValue = 119;
inline constexpr DispId kFindProperty = 121;
inline constexpr DispId kCreateProperty = 127;
inline constexpr DispId kOverrideProperty = 110;
inline constexpr DispId kName = 100;
inline constexpr DispId kDisplayName = 102;
inline constexpr DispId kStereotype = 212;
inline constexpr DispId kIdentifyClass = 12668;
inline constexpr DispId kIsKindOf = 12669;

// Class.
inline constexpr DispId kGetInheritRelations = 423;
inline constexpr DispId kDeleteInheritRel = 438;
inline constexpr DispId kGetAssignedComponents = 12491;
inline constexpr DispId kIsNested = 12643;
inline constexpr DispId kEnclosingClass = 12640;
inline constexpr DispId kGetClassKind = 415;
inline constexpr DispId kKindTest = 12438;
inline constexpr std::string_view kClassKind = "ClassKind";

// Attribute and operation: the owning class.
inline constexpr DispId kAttributeParentClass = 434;
inline constexpr DispId kOperationParentClass = 444;

// Relations, roles, associations.
inline constexpr DispId kHasClient = 12606;
inline constexpr DispId kHasSupplier = 12607;
inline constexpr DispId kGetClient = 12608;
inline constexpr DispId kGetSupplier = 12609;
inline constexpr DispId kGetSupplierClass = 12601;
inline constexpr DispId kRelationText = 412;
inline constexpr DispId kGetOtherRole = 417;
inline constexpr DispId kGetRoleClass = 621;
inline constexpr DispId kNavigable = 616;
inline constexpr DispId kModuleDependencyUnit = 618;

// Module (component).
inline constexpr DispId kModuleLanguage = 12566;

// Window position of the application, 16-bit.
inline constexpr DispId kWindowTop = 205;
inline constexpr DispId kWindowLeft = 206;
inline constexpr DispId kWindowHeight = 207;
inline constexpr DispId kWindowWidth = 208;

// Menu item types.
inline constexpr int16_t kItemDiagram = 1;
inline constexpr int16_t kItemClass = 4;
inline constexpr int16_t kItemAttribute = 5;
inline constexpr int16_t kItemOperation = 6;
inline constexpr int16_t kItemComponent = 7;
inline constexpr int16_t kItemRole = 8;

}  // namespace kpx::hostid
