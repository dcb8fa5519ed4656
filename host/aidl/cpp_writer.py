"""Writes the C++ interface library of checked AIDL declarations.

The public shape -- header paths, namespaces, class names, member types,
method signatures, descriptor, version and hash -- is that of the platform's
NDK back end, so that service code builds against either. Underneath, the
proxies carry calls through the host binder's queue instead of parcels.
"""

from typing import Dict, List, Tuple

from aidl_parser import Declaration, Method, Param, TypeRef

_PRIMITIVE_CPP = {
    'boolean': 'bool',
    'byte': 'int8_t',
    'int': 'int32_t',
    'long': 'int64_t',
    'float': 'float',
    'double': 'double',
}


class CppWriter:
    def __init__(self, decls: List[Declaration], version: int, api_hash: str,
                 sources: Dict[str, str]):
        self.decls = {d.name: d for d in decls}
        self.version = version
        self.api_hash = api_hash
        # Type name -> the .aidl path as it should appear in the banner.
        self.sources = sources
        package = decls[0].package
        # The NDK back end puts every package under a leading "aidl".
        self.namespace = 'aidl::' + package.replace('.', '::')
        self.include_dir = 'aidl/' + package.replace('.', '/')

    # Names.
    def qualified(self, name: str) -> str:
        return '::%s::%s' % (self.namespace, name)

    def header(self, name: str) -> str:
        return '%s/%s.h' % (self.include_dir, name)

    @staticmethod
    def bn_name(name: str) -> str:
        return 'Bn' + name[1:] if name.startswith('I') else 'Bn' + name

    @staticmethod
    def bp_name(name: str) -> str:
        return 'Bp' + name[1:] if name.startswith('I') else 'Bp' + name

    def cpp_type(self, ref: TypeRef) -> str:
        if ref.kind == 'List':
            base = 'std::vector<%s>' % self.cpp_type(ref.element)
        elif ref.is_array:
            element = TypeRef(ref.name, ref.line, kind=ref.kind)
            base = 'std::vector<%s>' % ('uint8_t' if ref.name == 'byte' else self.cpp_type(element))
        elif ref.kind == 'primitive':
            base = _PRIMITIVE_CPP[ref.name]
        elif ref.kind == 'String':
            base = 'std::string'
        elif ref.kind == 'interface':
            return 'std::shared_ptr<%s>' % self.qualified(ref.name)
        else:
            base = self.qualified(ref.name)
        return 'std::optional<%s>' % base if ref.nullable else base

    @staticmethod
    def by_value(ref: TypeRef) -> bool:
        return ref.kind in ('primitive', 'enum') and not ref.is_array and not ref.nullable

    def in_type(self, ref: TypeRef) -> str:
        cpp = self.cpp_type(ref)
        return cpp if self.by_value(ref) else 'const %s&' % cpp

    def default_init(self, ref: TypeRef) -> str:
        if ref.is_array or ref.nullable:
            return ''
        if ref.kind == 'primitive':
            return ' = false' if ref.name == 'boolean' else ' = 0'
        if ref.kind == 'enum':
            return ' = %s(0)' % self.qualified(ref.name)
        return ''

    def referenced(self, decl: Declaration) -> List[str]:
        """Declared types that |decl| names, sorted, itself excluded."""
        names = set()
        refs = [f.type for f in decl.fields]
        for method in decl.methods:
            refs += [p.type for p in method.params]
            if method.return_type is not None:
                refs.append(method.return_type)
        for ref in refs:
            target = ref.element if ref.kind == 'List' else ref
            if target.name in self.decls and target.name != decl.name:
                names.add(target.name)
        return sorted(names)

    def banner(self, decl: Declaration) -> List[str]:
        return ['// Generated from %s by host/aidl. Do not edit.' % self.sources[decl.name], '']

    def open_namespace(self) -> List[str]:
        return ['namespace %s {' % self.namespace]

    def close_namespace(self) -> List[str]:
        return ['}  // namespace %s' % self.namespace]

    # Files.
    def files(self) -> List[Tuple[str, str]]:
        """(relative path, contents) of every output, in a fixed order."""
        out = []
        for name in sorted(self.decls):
            decl = self.decls[name]
            if decl.kind == 'enum':
                out.append(('include/' + self.header(name), self.enum_header(decl)))
            elif decl.kind == 'parcelable':
                out.append(('include/' + self.header(name), self.parcelable_header(decl)))
                out.append(('src/%s.cpp' % name, self.parcelable_source(decl)))
            else:
                out.append(('include/' + self.header(name), self.interface_header(decl)))
                out.append(('include/' + self.header(self.bn_name(name)), self.bn_header(decl)))
                out.append(('include/' + self.header(self.bp_name(name)), self.bp_header(decl)))
                out.append(('src/%s.cpp' % name, self.interface_source(decl)))
        out.append(('src/parcel_checks.h', self.parcel_checks()))
        return out

    @staticmethod
    def join(lines: List[str]) -> str:
        return '\n'.join(lines) + '\n'

    # Enumerations.
    def enum_header(self, decl: Declaration) -> str:
        name = decl.name
        full = self.qualified(name)
        lines = self.banner(decl) + [
            '#pragma once', '',
            '#include <array>', '#include <cstdint>', '#include <string>', '',
            '#include <android/binder_enums.h>', '']
        lines += self.open_namespace()
        lines += ['', 'enum class %s : int8_t {' % name]
        lines += ['  %s = %d,' % (n, v) for n, v in decl.enumerators]
        lines += ['};', '']
        lines += ['// The declared name of |value|, or its signed decimal number.',
                  '[[nodiscard]] inline std::string toString(%s value) {' % name,
                  '  switch (value) {']
        for n, _ in decl.enumerators:
            lines += ['    case %s::%s:' % (name, n), '      return "%s";' % n]
        lines += ['    default:',
                  '      return std::to_string(static_cast<int8_t>(value));',
                  '  }', '}', '']
        lines += self.close_namespace()
        lines += ['', 'namespace ndk::internal {', '',
                  'template <>',
                  'constexpr inline std::array<%s, %d> enum_values<%s> = {'
                  % (full, len(decl.enumerators), full)]
        lines += ['    %s::%s,' % (full, n) for n, _ in decl.enumerators]
        lines += ['};', '', '}  // namespace ndk::internal']
        return self.join(lines)

    # Parcelables.
    def parcelable_header(self, decl: Declaration) -> str:
        name = decl.name
        lines = self.banner(decl) + [
            '#pragma once', '',
            '#include <cstdint>', '#include <optional>', '#include <sstream>', '#include <string>',
            '#include <tuple>', '#include <type_traits>', '#include <vector>', '',
            '#include <android/binder_to_string.h>']
        lines += ['#include <%s>' % self.header(n) for n in self.referenced(decl)]
        lines += ['']
        lines += self.open_namespace()
        lines += ['', 'class %s {' % name, ' public:',
                  '  typedef std::false_type fixed_size;',
                  '  static const char* descriptor;', '']
        for field in decl.fields:
            lines.append('  %s %s%s;' % (self.cpp_type(field.type), field.name,
                                         self.default_init(field.type)))
        if decl.fields:
            lines.append('')
        mine = ', '.join(f.name for f in decl.fields)
        theirs = ', '.join('rhs.' + f.name for f in decl.fields)
        for op in ('==', '!=', '<', '>', '<=', '>='):
            lines += ['  bool operator%s(const %s& rhs) const {' % (op, name),
                      '    return std::tie(%s) %s std::tie(%s);' % (mine, op, theirs),
                      '  }']
        lines += ['', '  std::string toString() const {',
                  '    std::ostringstream os;',
                  '    os << "%s{";' % name]
        for index, field in enumerate(decl.fields):
            label = ('' if index == 0 else ', ') + field.name + ': '
            lines.append('    os << "%s" << ::android::internal::ToString(%s);' % (label, field.name))
        lines += ['    os << "}";', '    return os.str();', '  }', '};', '']
        lines += self.close_namespace()
        return self.join(lines)

    def parcelable_source(self, decl: Declaration) -> str:
        lines = self.banner(decl) + ['#include <%s>' % self.header(decl.name), '']
        lines += self.open_namespace()
        lines += ['', 'const char* %s::descriptor = "%s";' % (decl.name, decl.qualified_name), '']
        lines += self.close_namespace()
        return self.join(lines)

    def parcel_checks(self) -> str:
        """What each parcelable puts in a parcel, for the proxies' ParcelCheck."""
        parcelables = [self.decls[n] for n in sorted(self.decls)
                       if self.decls[n].kind == 'parcelable']
        lines = ['// Generated by host/aidl. Do not edit.', '', '#pragma once', '',
                 '#include <binder_host/parcel_check.h>']
        lines += ['#include <%s>' % self.header(d.name) for d in parcelables]
        lines += [''] + self.open_namespace() + ['']
        signature = 'inline void CheckParcel(::ndk::host::ParcelCheck* check, const %s& value)'
        lines += [signature % d.name + ';' for d in parcelables]
        for decl in parcelables:
            lines += ['', signature % decl.name + ' {']
            lines += ['  check->Write(value.%s);' % f.name for f in decl.fields]
            if not decl.fields:
                lines.append('  (void)check;')
                lines.append('  (void)value;')
            lines.append('}')
        lines += [''] + self.close_namespace()
        return self.join(lines)

    # Interfaces.
    def all_methods(self, decl: Declaration) -> List[Method]:
        """The declared methods, then the two that every versioned interface has."""
        int_ref = TypeRef('int', decl.line, kind='primitive')
        string_ref = TypeRef('String', decl.line, kind='String')
        return decl.methods + [Method('getInterfaceVersion', int_ref, [], decl.line),
                               Method('getInterfaceHash', string_ref, [], decl.line)]

    def param_decl(self, param: Param, unused: bool = False) -> str:
        name = ('/*%s*/' if unused else '%s') % (('out_' if param.direction == 'out' else 'in_')
                                               + param.name)
        if param.direction == 'out':
            return '%s* %s' % (self.cpp_type(param.type), name)
        return '%s %s' % (self.in_type(param.type), name)

    def signature(self, method: Method, qualifier: str = '', unused: bool = False) -> str:
        params = [self.param_decl(p, unused) for p in method.params]
        if method.return_type is not None:
            params.append('%s* %s' % (self.cpp_type(method.return_type),
                                      '/*_aidl_return*/' if unused else '_aidl_return'))
        return '::ndk::ScopedAStatus %s%s(%s)' % (qualifier, method.name, ', '.join(params))

    def interface_header(self, decl: Declaration) -> str:
        name = decl.name
        lines = self.banner(decl) + [
            '#pragma once', '',
            '#include <cstdint>', '#include <memory>', '#include <optional>', '#include <string>',
            '#include <vector>', '',
            '#include <android/binder_auto_utils.h>', '#include <android/binder_ibinder.h>',
            '#include <android/binder_interface_utils.h>']
        lines += ['#include <%s>' % self.header(n) for n in self.referenced(decl)]
        lines += ['']
        lines += self.open_namespace()
        lines += ['', 'class %s : public ::ndk::ICInterface {' % name, ' public:',
                  '  static const char* descriptor;',
                  '  %s();' % name,
                  '  virtual ~%s();' % name, '',
                  '  static const int32_t version = %d;' % self.version,
                  '  static inline const std::string hash = "%s";' % self.api_hash]
        for index, method in enumerate(decl.methods):
            lines.append('  static constexpr uint32_t TRANSACTION_%s = FIRST_CALL_TRANSACTION + %d;'
                         % (method.name, index))
        lines += ['',
                  '  // A proxy that carries calls to the object behind |binder|; null when the',
                  '  // binder is null or stands for another interface.',
                  '  static std::shared_ptr<%s> fromBinder(const ::ndk::SpAIBinder& binder);' % name,
                  '']
        for method in self.all_methods(decl):
            lines.append('  virtual %s = 0;' % self.signature(method))
        lines += ['};', '',
                  '// Answers every operation as unknown to the remote side; version 0, no hash.',
                  'class %s : public %s {' % (self.default_name(name), name), ' public:']
        for method in self.all_methods(decl):
            lines.append('  %s override;' % self.signature(method))
        lines += ['  ::ndk::SpAIBinder asBinder() override;', '  bool isRemote() override;', '};',
                  '']
        lines += self.close_namespace()
        return self.join(lines)

    @staticmethod
    def default_name(name: str) -> str:
        return name + 'Default'

    def default_source(self, decl: Declaration) -> List[str]:
        default = self.default_name(decl.name)
        lines = []
        for method in self.all_methods(decl):
            unused = method.name not in ('getInterfaceVersion', 'getInterfaceHash')
            lines.append('%s {' % self.signature(method, default + '::', unused))
            if method.name == 'getInterfaceVersion':
                lines += ['  *_aidl_return = 0;', '  return ::ndk::ScopedAStatus::ok();']
            elif method.name == 'getInterfaceHash':
                lines += ['  *_aidl_return = "";', '  return ::ndk::ScopedAStatus::ok();']
            else:
                lines += ['  return ::ndk::ScopedAStatus::fromStatus(STATUS_UNKNOWN_TRANSACTION);']
            lines += ['}', '']
        return lines + ['::ndk::SpAIBinder %s::asBinder() { return ::ndk::SpAIBinder(); }' % default,
                        'bool %s::isRemote() { return false; }' % default, '']

    def bn_header(self, decl: Declaration) -> str:
        bn = self.bn_name(decl.name)
        lines = self.banner(decl) + [
            '#pragma once', '', '#include <cstdint>', '#include <string>', '',
            '#include <android/binder_auto_utils.h>', '#include <android/binder_interface_utils.h>',
            '#include <%s>' % self.header(decl.name), '']
        lines += self.open_namespace()
        lines += ['', '// Base of the local implementation of %s.' % decl.name,
                  'class %s : public ::ndk::BnCInterface<%s> {' % (bn, decl.name), ' public:',
                  '  %s();' % bn, '  virtual ~%s();' % bn, '',
                  '  ::ndk::ScopedAStatus getInterfaceVersion(int32_t* _aidl_return) final;',
                  '  ::ndk::ScopedAStatus getInterfaceHash(std::string* _aidl_return) final;', '',
                  ' protected:', '  ::ndk::SpAIBinder createBinder() override;', '};', '']
        lines += self.close_namespace()
        return self.join(lines)

    def bp_header(self, decl: Declaration) -> str:
        bp = self.bp_name(decl.name)
        lines = self.banner(decl) + [
            '#pragma once', '',
            '#include <android/binder_auto_utils.h>', '#include <android/binder_interface_utils.h>',
            '#include <%s>' % self.header(decl.name), '']
        lines += self.open_namespace()
        lines += ['', '// Proxy of %s: each call runs on the service thread.' % decl.name,
                  'class %s : public ::ndk::BpCInterface<%s> {' % (bp, decl.name), ' public:',
                  '  explicit %s(const ::ndk::SpAIBinder& binder);' % bp,
                  '  virtual ~%s();' % bp, '']
        for method in self.all_methods(decl):
            lines.append('  %s override;' % self.signature(method))
        lines += ['};', '']
        lines += self.close_namespace()
        return self.join(lines)

    def proxy_of(self, ref: TypeRef, value: str) -> str:
        """|value| as the other side should see it: interfaces become proxies."""
        if ref.kind != 'interface':
            return value
        return ('%s::fromBinder(%s ? %s->asBinder() : ::ndk::SpAIBinder())'
                % (self.qualified(ref.name), value, value))

    def proxy_method(self, decl: Declaration, method: Method) -> List[str]:
        bp = self.bp_name(decl.name)
        lines = ['%s {' % self.signature(method, bp + '::'),
                 '  ::ndk::host::ParcelCheck request(descriptor);']
        lines += ['  request.Write(in_%s);' % p.name for p in method.params if p.direction != 'out']
        lines += ['  if (request.status() != STATUS_OK) {',
                  '    return ::ndk::ScopedAStatus::fromStatus(request.status());', '  }',
                  '  ::ndk::SpAIBinder binder = asBinder();',
                 '  std::shared_ptr<%s> target =' % self.qualified(decl.name),
                 '      std::dynamic_pointer_cast<%s>(::ndk::host::GetLocalObject(binder.get()));'
                 % self.qualified(decl.name),
                 '  if (target == nullptr) return ::ndk::ScopedAStatus::fromStatus(STATUS_BAD_TYPE);']
        args = []
        for param in method.params:
            if param.direction == 'out':
                lines.append('  %s out_value_%s{};' % (self.cpp_type(param.type), param.name))
                args.append('&out_value_%s' % param.name)
            elif param.type.kind == 'interface':
                lines.append('  %s in_proxy_%s = %s;' % (
                    self.cpp_type(param.type), param.name,
                    self.proxy_of(param.type, 'in_' + param.name)))
                args.append('in_proxy_%s' % param.name)
            else:
                args.append('in_' + param.name)
        if method.return_type is not None:
            lines.append('  %s return_value{};' % self.cpp_type(method.return_type))
            args.append('&return_value')
        lines += ['  ::ndk::ScopedAStatus status;',
                  '  const binder_status_t transport = ::ndk::host::Transact(binder.get(), [&]() {',
                  '    status = target->%s(%s);' % (method.name, ', '.join(args)),
                  '  });',
                  '  if (transport != STATUS_OK) return ::ndk::ScopedAStatus::fromStatus(transport);',
                  '  // A failed transaction crosses as its transport status alone.',
                  '  if (status.getExceptionCode() == EX_TRANSACTION_FAILED) {',
                  '    return ::ndk::ScopedAStatus::fromStatus(status.getStatus());', '  }']
        has_outputs = method.return_type is not None or any(
            p.direction == 'out' for p in method.params)
        if has_outputs:
            # Out-values reach the caller only on success, and only when the
            # reply could carry them.
            lines += ['  if (!status.isOk()) return status;',
                      '  ::ndk::host::ParcelCheck reply;']
            lines += ['  reply.Write(out_value_%s);' % p.name for p in method.params
                      if p.direction == 'out']
            if method.return_type is not None:
                lines.append('  reply.Write(return_value);')
            lines += ['  if (reply.status() != STATUS_OK) {',
                      '    return ::ndk::ScopedAStatus::fromStatus(reply.status());', '  }']
        for param in method.params:
            if param.direction == 'out':
                lines.append('  *out_%s = std::move(out_value_%s);' % (param.name, param.name))
        if method.return_type is not None:
            lines.append('  *_aidl_return = %s;' % (
                self.proxy_of(method.return_type, 'return_value')
                if method.return_type.kind == 'interface' else 'std::move(return_value)'))
        lines += ['  return status;', '}', '']
        return lines

    def interface_source(self, decl: Declaration) -> str:
        name = decl.name
        bn = self.bn_name(name)
        bp = self.bp_name(name)
        lines = self.banner(decl) + [
            '#include <%s>' % self.header(name),
            '#include <%s>' % self.header(bn),
            '#include <%s>' % self.header(bp), '',
            '#include <cstring>', '#include <utility>', '',
            '#include <binder_host/host.h>', '#include <binder_host/parcel_check.h>', '',
            '#include "parcel_checks.h"', '']
        lines += self.open_namespace()
        lines += ['',
                  'const char* %s::descriptor = "%s";' % (name, decl.qualified_name), '',
                  '%s::%s() = default;' % (name, name),
                  '%s::~%s() = default;' % (name, name), '',
                  'std::shared_ptr<%s> %s::fromBinder(const ::ndk::SpAIBinder& binder) {'
                  % (name, name),
                  '  const char* binder_descriptor = ::ndk::host::GetDescriptor(binder.get());',
                  '  if (binder_descriptor == nullptr || std::strcmp(binder_descriptor, descriptor) != 0) {',
                  '    return nullptr;', '  }',
                  '  return ::ndk::SharedRefBase::make<%s>(binder);' % bp, '}', '',
                  '%s::%s() = default;' % (bn, bn),
                  '%s::~%s() = default;' % (bn, bn), '',
                  '::ndk::ScopedAStatus %s::getInterfaceVersion(int32_t* _aidl_return) {' % bn,
                  '  *_aidl_return = %s::version;' % name,
                  '  return ::ndk::ScopedAStatus::ok();', '}', '',
                  '::ndk::ScopedAStatus %s::getInterfaceHash(std::string* _aidl_return) {' % bn,
                  '  *_aidl_return = %s::hash;' % name,
                  '  return ::ndk::ScopedAStatus::ok();', '}', '',
                  '::ndk::SpAIBinder %s::createBinder() {' % bn,
                  '  return ::ndk::host::NewLocalBinder(descriptor, ref<::ndk::ICInterface>());',
                  '}', '',
                  '%s::%s(const ::ndk::SpAIBinder& binder) : BpCInterface(binder) {}' % (bp, bp),
                  '%s::~%s() = default;' % (bp, bp), '']
        for method in self.all_methods(decl):
            lines += self.proxy_method(decl, method)
        lines += self.default_source(decl)
        lines += self.close_namespace()
        return self.join(lines)
