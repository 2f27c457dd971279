#include "tools/type_library/type_library_dump.h"

#include <algorithm>
#include <cstdio>
#include <initializer_list>
#include <iterator>
#include <stdexcept>
#include <string_view>
#include <vector>

#include "com/com_ptr.h"
#include "platform/com.h"
#include "platform/text.h"

namespace {

using KelvoUHW::ComPtr;

void Check(HRESULT result, const char* call) {
  char text[80];
  std::snprintf(text, sizeof text, "%s: 0x%08lX", call, static_cast<unsigned long>(result));
  if (FAILED(result)) throw std::runtime_error(text);
}

std::string Take(BSTR text) {
  const std::string taken = platform::ToUtf8(platform::BstrText(text));
  SysFreeString(text);
  return taken;
}

std::string Number(unsigned long value, const char* format = "%lu") {
  char text[16];
  std::snprintf(text, sizeof text, format, value);
  return text;
}

std::string Join(std::initializer_list<std::string_view> parts) {
  std::string text;
  for (const std::string_view part : parts) text.append(part);
  return text;
}

struct Flag {
  unsigned value;
  const char* name;
};

// "[in, out] ", and a number for what none of the names stands for.
template <std::size_t Count>
std::string Flags(unsigned flags, const Flag (&names)[Count]) {
  std::string text;
  const auto add = [&](const std::string& name) { text += (text.empty() ? "" : ", ") + name; };
  for (const Flag& flag : names) {
    if (flags & flag.value) add(flag.name);
    flags &= ~flag.value;
  }
  if (flags != 0) add(Number(flags, "0x%lX"));
  return text.empty() ? "" : Join({"[", text, "]"});
}

constexpr Flag kTypeFlags[] = {{TYPEFLAG_FCANCREATE, "can create"},
                               {TYPEFLAG_FDISPATCHABLE, "dispatchable"},
                               {TYPEFLAG_FDUAL, "dual"},
                               {TYPEFLAG_FNONEXTENSIBLE, "nonextensible"},
                               {TYPEFLAG_FOLEAUTOMATION, "oleautomation"}};
constexpr Flag kParameterFlags[] = {
    {PARAMFLAG_FIN, "in"}, {PARAMFLAG_FOUT, "out"}, {PARAMFLAG_FRETVAL, "retval"}};
constexpr Flag kImplementedFlags[] = {{IMPLTYPEFLAG_FDEFAULT, "default"},
                                      {IMPLTYPEFLAG_FSOURCE, "source"}};

std::string Name(ITypeInfo& type, MEMBERID member = MEMBERID_NIL) {
  BSTR name = nullptr;
  Check(type.GetDocumentation(member, &name, nullptr, nullptr, nullptr), "GetDocumentation");
  return Take(name);
}

// " \"its help string\"" of the type or of a member; other documentation than that is not expected.
std::string Help(ITypeInfo& type, MEMBERID member = MEMBERID_NIL) {
  BSTR help = nullptr;
  BSTR file = nullptr;
  DWORD context = 0;
  Check(type.GetDocumentation(member, nullptr, &help, &context, &file), "GetDocumentation");
  std::string text = Take(help);
  if (!text.empty()) text = Join({" \"", text, "\""});
  const std::string helpFile = Take(file);
  if (!helpFile.empty() || context != 0) text += Join({" help ", helpFile, " ", Number(context)});
  return text;
}

std::string Referred(ITypeInfo& type, HREFTYPE reference) {
  ComPtr<ITypeInfo> referred;
  Check(type.GetRefTypeInfo(reference, referred.Put()), "GetRefTypeInfo");
  return Name(*referred.Get());
}

// The name of a number, or `other` and the number.
template <std::size_t Count>
std::string NameOf(unsigned value, const Flag (&names)[Count], const char* other) {
  const auto found = std::ranges::find(names, value, &Flag::value);
  return found == std::end(names) ? other + Number(value) : found->name;
}

constexpr Flag kTypes[] = {{VT_BSTR, "BSTR"},         {VT_BOOL, "VARIANT_BOOL"},
                           {VT_I4, "long"},           {VT_UI4, "unsigned long"},
                           {VT_UI1, "unsigned char"}, {VT_UNKNOWN, "IUnknown*"},
                           {VT_HRESULT, "HRESULT"},   {VT_VOID, "void"}};
constexpr Flag kInvocations[] = {{INVOKE_FUNC, "method"}, {INVOKE_PROPERTYGET, "propget"}};
constexpr Flag kTypeKinds[] = {{TKIND_INTERFACE, "interface"},
                               {TKIND_DISPATCH, "dispinterface"},
                               {TKIND_ENUM, "enum"},
                               {TKIND_ALIAS, "alias"},
                               {TKIND_COCLASS, "coclass"}};

std::string TypeText(ITypeInfo& type, const TYPEDESC& description) {
  if (description.vt == VT_PTR) return TypeText(type, *description.lptdesc) + "*";
  if (description.vt == VT_USERDEFINED) return Referred(type, description.hreftype);
  return NameOf(description.vt, kTypes, "vt");
}

std::string FunctionText(ITypeInfo& type, const FUNCDESC& function, FUNCKIND expectedKind) {
  std::vector<BSTR> names(static_cast<std::size_t>(function.cParams) + 1);
  UINT count = 0;
  Check(type.GetNames(function.memid, names.data(), static_cast<UINT>(names.size()), &count),
        "GetNames");
  const std::string name = Take(names[0]);
  std::string parameters;
  for (SHORT i = 0; i < function.cParams; ++i) {
    const ELEMDESC& parameter = function.lprgelemdescParam[i];
    std::string text = Flags(parameter.paramdesc.wParamFlags, kParameterFlags);
    if (!text.empty()) text += " ";
    const auto position = static_cast<std::size_t>(i) + 1;
    text += Join(
        {TypeText(type, parameter.tdesc), " ", position < count ? Take(names[position]) : "?"});
    parameters += (parameters.empty() ? "" : ", ") + text;
  }
  std::string text = Join({Number(static_cast<unsigned long>(function.memid), "0x%lx"), " ",
                           NameOf(function.invkind, kInvocations, "kind"), " ",
                           TypeText(type, function.elemdescFunc.tdesc), " ", name, "(", parameters,
                           ")", Help(type, function.memid)});
  if (function.callconv != CC_STDCALL)
    text += Join({" call", Number(static_cast<unsigned long>(function.callconv))});
  if (function.funckind != expectedKind)
    text += Join({" function", Number(static_cast<unsigned long>(function.funckind))});
  if (function.wFuncFlags != 0) text += Join({" flags ", Number(function.wFuncFlags)});
  if (function.cParamsOpt != 0)
    text += Join({" optional ", Number(static_cast<unsigned long>(function.cParamsOpt))});
  return text;
}

// Functions that the types of the standard library put before are left out.
std::string Functions(ITypeInfo& type, const TYPEATTR& attributes) {
  const bool dispatch = attributes.typekind == TKIND_DISPATCH;
  std::string text;
  int slot = 0;
  for (UINT i = 0; i < attributes.cFuncs; ++i) {
    FUNCDESC* function = nullptr;
    Check(type.GetFuncDesc(i, &function), "GetFuncDesc");
    const bool inherited = dispatch && (function->wFuncFlags & FUNCFLAG_FRESTRICTED) != 0;
    if (!inherited) {
      constexpr int kIUnknownSlots = 3;
      const int place = function->oVft / static_cast<int>(sizeof(void*)) - kIUnknownSlots + 1;
      text +=
          Join({"  ", Number(static_cast<unsigned long>(dispatch ? ++slot : place)), " ",
                FunctionText(type, *function, dispatch ? FUNC_DISPATCH : FUNC_PUREVIRTUAL), "\n"});
    }
    type.ReleaseFuncDesc(function);
  }
  return text;
}

std::string Values(ITypeInfo& type, const TYPEATTR& attributes) {
  std::string text;
  for (UINT i = 0; i < attributes.cVars; ++i) {
    VARDESC* variable = nullptr;
    Check(type.GetVarDesc(i, &variable), "GetVarDesc");
    const bool number = variable->varkind == VAR_CONST && variable->lpvarValue->vt == VT_I4;
    text += Join({"  ", Name(type, variable->memid), " = ",
                  number ? std::to_string(variable->lpvarValue->lVal) : std::string("no number"),
                  Help(type, variable->memid), "\n"});
    type.ReleaseVarDesc(variable);
  }
  return text;
}

std::string Implemented(ITypeInfo& type, const TYPEATTR& attributes) {
  std::string text;
  for (UINT i = 0; i < attributes.cImplTypes; ++i) {
    INT flags = 0;
    HREFTYPE reference = 0;
    Check(type.GetImplTypeFlags(i, &flags), "GetImplTypeFlags");
    Check(type.GetRefTypeOfImplType(i, &reference), "GetRefTypeOfImplType");
    text += Join({"  ", Flags(static_cast<unsigned>(flags), kImplementedFlags), " ",
                  Referred(type, reference), "\n"});
  }
  return text;
}

std::string DumpType(ITypeInfo& type, const TYPEATTR& attributes) {
  std::string text = Join({NameOf(attributes.typekind, kTypeKinds, "kind"), " ", Name(type)});
  if (attributes.typekind == TKIND_ALIAS)
    text += Join({" of ", TypeText(type, attributes.tdescAlias)});
  if (attributes.typekind == TKIND_INTERFACE) {
    HREFTYPE base = 0;
    Check(type.GetRefTypeOfImplType(0, &base), "GetRefTypeOfImplType");
    text += Join({" : ", Referred(type, base)});
  }
  const platform::Guid guid = platform::FromSystemGuid(attributes.guid);
  text += Join(
      {" ", guid == platform::Guid{} ? "no GUID" : platform::ToUtf8(platform::GuidText(guid))});
  text += Join({" ", Number(attributes.wMajorVerNum), ".", Number(attributes.wMinorVerNum)});
  const std::string flags = Flags(attributes.wTypeFlags, kTypeFlags);
  text += Join({flags.empty() ? "" : " ", flags, Help(type), "\n"});
  text += Functions(type, attributes) + Values(type, attributes);
  return attributes.typekind == TKIND_COCLASS ? text + Implemented(type, attributes) : text;
}

}  // namespace

std::string DumpTypeLibrary(const std::u16string& path) {
  ComPtr<ITypeLib> library;
  Check(LoadTypeLibEx(platform::ToSystemText(path.c_str()), REGKIND_NONE, library.Put()),
        "LoadTypeLibEx");
  TLIBATTR* own = nullptr;
  Check(library->GetLibAttr(&own), "GetLibAttr");
  BSTR name = nullptr;
  BSTR help = nullptr;
  Check(library->GetDocumentation(-1, &name, &help, nullptr, nullptr), "GetDocumentation");
  std::string text =
      Join({"library ", Take(name), " ",
            platform::ToUtf8(platform::GuidText(platform::FromSystemGuid(own->guid))), " ",
            Number(own->wMajorVerNum), ".", Number(own->wMinorVerNum),
            own->syskind == SYS_WIN64   ? " SYS_WIN64"
            : own->syskind == SYS_WIN32 ? " SYS_WIN32"
                                        : " another system",
            " \"", Take(help), "\""});
  if (own->lcid != 0) text += Join({" locale ", Number(own->lcid)});
  text += "\n";
  library->ReleaseTLibAttr(own);
  for (UINT i = 0; i < library->GetTypeInfoCount(); ++i) {
    ComPtr<ITypeInfo> type;
    Check(library->GetTypeInfo(i, type.Put()), "GetTypeInfo");
    TYPEATTR* attributes = nullptr;
    Check(type->GetTypeAttr(&attributes), "GetTypeAttr");
    text += Join({Number(i), " ", DumpType(*type.Get(), *attributes)});
    type->ReleaseTypeAttr(attributes);
  }
  return text;
}
