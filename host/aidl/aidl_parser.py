"""Reads the subset of AIDL that the HAL interface uses.

Supported: one package declaration, imports of types of the same package,
and one declaration per file -- a byte-backed enum, a parcelable or an
interface -- annotated @VintfStability. Fields and parameters take the
primitive types, String, declared types, T[] and List<T>, optionally
@nullable; parameters may be `in` or `out`. Anything else is refused with an
AidlError naming the file, the line and the reason.

Name resolution follows the platform compiler: a type of the package is
found through its `import` line or its fully qualified name, never merely
because it sits in the same directory.
"""

import dataclasses
import os
import re
from typing import Dict, List, Optional, Tuple

PRIMITIVES = ('boolean', 'byte', 'int', 'long', 'float', 'double')
# Types that the platform compiler refuses for the NDK back end.
NDK_REFUSED = ('Map', 'CharSequence', 'FileDescriptor')
KEYWORDS = ('package', 'import', 'parcelable', 'interface', 'enum', 'in', 'out',
            'inout', 'oneway', 'void', 'const', 'union')
# Names the generated C++ cannot use as identifiers.
CPP_RESERVED = frozenset(
    'alignas alignof and asm auto bitand bitor bool break case catch char class compl '
    'const constexpr const_cast continue decltype default delete do double dynamic_cast '
    'else enum explicit export extern false float for friend goto if inline int long '
    'mutable namespace new noexcept not nullptr operator or private protected public '
    'register reinterpret_cast return short signed sizeof static static_assert '
    'static_cast struct switch template this thread_local throw true try typedef typeid '
    'typename union unsigned using virtual void volatile wchar_t while xor'.split())


class AidlError(Exception):
    """A refused input, formatted as `file:line: reason`."""

    def __init__(self, path: str, line: int, reason: str):
        super().__init__('%s:%d: %s' % (path, line, reason))
        self.path = path
        self.line = line
        self.reason = reason


@dataclasses.dataclass
class Annotation:
    name: str
    params: Dict[str, str]
    line: int


@dataclasses.dataclass
class TypeRef:
    name: str                      # primitive, 'String', 'List' or a declared name
    line: int
    qualified: bool = False        # written with its package
    element: Optional['TypeRef'] = None   # the T of List<T>
    is_array: bool = False
    nullable: bool = False
    kind: str = ''                 # filled by resolution: see Resolver.kind_of


@dataclasses.dataclass
class Field:
    type: TypeRef
    name: str
    line: int


@dataclasses.dataclass
class Param:
    direction: str                 # 'in' or 'out'
    type: TypeRef
    name: str
    line: int
    written_direction: str = ''    # as the source has it, '' when left out


@dataclasses.dataclass
class Method:
    name: str
    return_type: Optional[TypeRef]  # None for void
    params: List[Param]
    line: int


@dataclasses.dataclass
class Declaration:
    kind: str                      # 'enum', 'parcelable' or 'interface'
    name: str
    package: str
    path: str
    line: int
    fields: List[Field] = dataclasses.field(default_factory=list)
    methods: List[Method] = dataclasses.field(default_factory=list)
    enumerators: List[Tuple[str, int]] = dataclasses.field(default_factory=list)
    # The value of each enumerator as the source spells it.
    enumerator_texts: List[str] = dataclasses.field(default_factory=list)
    backing: str = ''
    # Imported type name -> line of its import.
    imports: Dict[str, int] = dataclasses.field(default_factory=dict)

    @property
    def qualified_name(self) -> str:
        return self.package + '.' + self.name


_TOKEN = re.compile(r'''
    (?P<space>[ \t\r\f\v]+) | (?P<newline>\n) |
    (?P<line_comment>//[^\n]*) | (?P<block_comment>/\*.*?\*/) |
    (?P<string>"[^"\n]*") |
    (?P<number>-?(?:0[xX][0-9a-fA-F]+|\d+)) |
    (?P<name>[A-Za-z_][A-Za-z0-9_]*(?:\.[A-Za-z_][A-Za-z0-9_]*)*) |
    (?P<punct>[{}()<>\[\];,=@])
''', re.VERBOSE | re.DOTALL)


def _tokenize(path: str, text: str) -> List[Tuple[str, str, int]]:
    tokens = []
    line = 1
    pos = 0
    while pos < len(text):
        match = _TOKEN.match(text, pos)
        if match is None:
            raise AidlError(path, line, 'unexpected character %r' % text[pos])
        kind = match.lastgroup
        value = match.group()
        if kind in ('name', 'number', 'string', 'punct'):
            tokens.append((kind, value, line))
        line += value.count('\n')
        pos = match.end()
    tokens.append(('end', '', line))
    return tokens


class _Parser:
    """Recursive descent over one file's tokens."""

    def __init__(self, path: str, text: str):
        self.path = path
        self.tokens = _tokenize(path, text)
        self.pos = 0

    # Token helpers.
    def peek(self, offset: int = 0) -> Tuple[str, str, int]:
        return self.tokens[min(self.pos + offset, len(self.tokens) - 1)]

    def line(self) -> int:
        return self.peek()[2]

    def fail(self, reason: str, line: Optional[int] = None):
        raise AidlError(self.path, self.line() if line is None else line, reason)

    def take(self, value: Optional[str] = None, kind: Optional[str] = None) -> str:
        token_kind, token_value, _ = self.peek()
        if value is not None and token_value != value:
            self.fail('expected "%s" but found "%s"' % (value, token_value or 'end of file'))
        if kind is not None and token_kind != kind:
            self.fail('expected a %s but found "%s"' % (kind, token_value or 'end of file'))
        self.pos += 1
        return token_value

    def accept(self, value: str) -> bool:
        if self.peek()[1] == value and self.peek()[0] != 'string':
            self.pos += 1
            return True
        return False

    def identifier(self, what: str) -> str:
        line = self.line()
        name = self.take(kind='name')
        if '.' in name or name in KEYWORDS:
            self.fail('"%s" is not a valid %s name' % (name, what), line)
        if name in CPP_RESERVED:
            self.fail('"%s" cannot be used as a %s name in C++' % (name, what), line)
        return name

    # Grammar.
    def document(self) -> Declaration:
        self.take('package')
        package = self.take(kind='name')
        self.take(';')
        imports = {}
        while self.peek()[1] == 'import':
            line = self.line()
            self.take('import')
            imported = self.take(kind='name')
            self.take(';')
            if imported.rpartition('.')[0] != package:
                self.fail('imports from other packages are not supported: %s' % imported, line)
            if imported.rpartition('.')[2] in imports:
                self.fail('import %s is duplicated' % imported, line)
            imports[imported.rpartition('.')[2]] = line
        self.package = package
        annotations = self.annotations()
        line = self.line()
        keyword = self.peek()[1]
        if keyword == 'enum':
            decl = self.enum_decl(package, line)
        elif keyword == 'parcelable':
            decl = self.parcelable_decl(package, line)
        elif keyword == 'interface':
            decl = self.interface_decl(package, line)
        elif keyword in ('oneway', 'union', 'const'):
            self.fail('"%s" declarations are not supported' % keyword)
        else:
            self.fail('expected enum, parcelable or interface but found "%s"' % keyword)
        if self.peek()[0] != 'end':
            self.fail('only one declaration per file is supported')
        self.apply_declaration_annotations(decl, annotations)
        decl.imports = imports
        return decl

    def annotations(self) -> List[Annotation]:
        result = []
        while self.peek()[1] == '@':
            line = self.line()
            self.take('@')
            name = self.take(kind='name')
            params = {}
            if self.accept('('):
                while True:
                    key = self.take(kind='name')
                    self.take('=')
                    params[key] = self.take(kind='string').strip('"')
                    if not self.accept(','):
                        break
                self.take(')')
            result.append(Annotation(name, params, line))
        return result

    def apply_declaration_annotations(self, decl: Declaration, annotations: List[Annotation]):
        names = [a.name for a in annotations]
        for annotation in annotations:
            if annotation.name == 'VintfStability' and not annotation.params:
                continue
            if annotation.name == 'Backing' and decl.kind == 'enum':
                if annotation.params != {'type': 'byte'}:
                    self.fail('only @Backing(type="byte") is supported', annotation.line)
                decl.backing = 'byte'
                continue
            self.fail('annotation @%s is not supported here' % annotation.name, annotation.line)
        if 'VintfStability' not in names:
            self.fail('%s %s must be @VintfStability' % (decl.kind, decl.name), decl.line)
        if decl.kind == 'enum' and not decl.backing:
            self.fail('enum %s needs @Backing(type="byte")' % decl.name, decl.line)

    def type_ref(self) -> TypeRef:
        annotations = self.annotations()
        line = self.line()
        name = self.take(kind='name')
        if name in ('void', 'in', 'out', 'inout', 'oneway'):
            self.fail('expected a type but found "%s"' % name, line)
        if name in NDK_REFUSED:
            self.fail('type %s is not supported by the NDK back end' % name, line)
        if name in ('char', 'IBinder', 'ParcelFileDescriptor', 'ParcelableHolder'):
            self.fail('type %s is not supported' % name, line)
        qualified = '.' in name
        if qualified:
            package, _, name = name.rpartition('.')
            if package != self.package:
                self.fail("Failed to resolve '%s.%s'" % (package, name), line)
        ref = TypeRef(name, line, qualified=qualified)
        if self.accept('<'):
            if name != 'List':
                self.fail('only List<T> may take a type argument', line)
            ref.element = self.type_ref()
            self.take('>')
        elif name == 'List':
            self.fail('List needs an element type: List<T>', line)
        if self.accept('['):
            self.take(']')
            ref.is_array = True
            if self.peek()[1] == '[':
                self.fail('arrays of arrays are not supported')
        for annotation in annotations:
            if annotation.name != 'nullable' or annotation.params:
                self.fail('annotation @%s is not supported on a type' % annotation.name,
                          annotation.line)
            ref.nullable = True
        return ref

    def enum_decl(self, package: str, line: int) -> Declaration:
        self.take('enum')
        decl = Declaration('enum', self.identifier('enum'), package, self.path, line)
        self.take('{')
        next_value = 0
        while not self.accept('}'):
            value_line = self.line()
            name = self.identifier('enumerator')
            text = None
            if self.accept('='):
                text = self.take(kind='number')
                next_value = int(text, 0)
            if not -128 <= next_value <= 127:
                self.fail('value %d of %s does not fit the byte backing' % (next_value, name),
                          value_line)
            if any(name == n for n, _ in decl.enumerators):
                self.fail('enumerator %s is declared twice' % name, value_line)
            if any(next_value == v for _, v in decl.enumerators):
                self.fail('enumerators with the same value are not supported', value_line)
            decl.enumerators.append((name, next_value))
            decl.enumerator_texts.append(str(next_value) if text is None else text)
            next_value += 1
            if not self.accept(','):
                self.take('}')
                break
        if not decl.enumerators:
            self.fail('enum %s declares no values' % decl.name, line)
        return decl

    def parcelable_decl(self, package: str, line: int) -> Declaration:
        self.take('parcelable')
        decl = Declaration('parcelable', self.identifier('parcelable'), package, self.path, line)
        if self.peek()[1] == ';':
            self.fail('structured parcelables need a body; forward declarations are not supported')
        self.take('{')
        while not self.accept('}'):
            if self.peek()[1] in ('const', 'parcelable', 'enum', 'interface', 'union'):
                self.fail('nested "%s" declarations are not supported' % self.peek()[1])
            field_type = self.type_ref()
            field_line = self.line()
            name = self.identifier('field')
            if self.peek()[1] == '=':
                self.fail('field default values are not supported')
            self.take(';')
            if any(f.name == name for f in decl.fields):
                self.fail('field %s is declared twice' % name, field_line)
            decl.fields.append(Field(field_type, name, field_line))
        return decl

    def interface_decl(self, package: str, line: int) -> Declaration:
        self.take('interface')
        decl = Declaration('interface', self.identifier('interface'), package, self.path, line)
        self.take('{')
        while not self.accept('}'):
            if self.peek()[1] in ('const', 'parcelable', 'enum', 'interface', 'union'):
                self.fail('nested "%s" declarations are not supported' % self.peek()[1])
            if self.annotations():
                self.fail('annotations on methods are not supported')
            method_line = self.line()
            if self.peek()[1] == 'oneway':
                self.fail('oneway methods are not supported')
            return_type = None if self.accept('void') else self.type_ref()
            name = self.identifier('method')
            self.take('(')
            params = []
            while not self.accept(')'):
                if params:
                    self.take(',')
                params.append(self.param())
            if self.peek()[1] == '=':
                self.fail('explicit transaction codes are not supported')
            self.take(';')
            if any(m.name == name for m in decl.methods):
                self.fail('method %s is declared twice; overloading is not supported' % name,
                          method_line)
            if name in ('getInterfaceVersion', 'getInterfaceHash'):
                self.fail('method name %s is reserved' % name, method_line)
            decl.methods.append(Method(name, return_type, params, method_line))
        return decl

    def param(self) -> Param:
        line = self.line()
        direction = ''
        if self.peek()[1] in ('in', 'out', 'inout'):
            direction = self.take()
        param_type = self.type_ref()
        name = self.identifier('parameter')
        return Param(direction, param_type, name, line, written_direction=direction)


def parse_file(path: str) -> Declaration:
    with open(path, encoding='utf-8') as source:
        text = source.read()
    decl = _Parser(path, text).document()
    expected = os.path.splitext(os.path.basename(path))[0]
    if decl.name != expected:
        raise AidlError(path, decl.line, 'type %s must be declared in %s.aidl'
                        % (decl.name, decl.name))
    return decl


class Resolver:
    """Checks the declared types of a package against each other."""

    def __init__(self, decls: List[Declaration]):
        self.decls = {}
        packages = set()
        for decl in decls:
            if decl.name in self.decls:
                raise AidlError(decl.path, decl.line, 'type %s is declared twice' % decl.name)
            self.decls[decl.name] = decl
            packages.add(decl.package)
        if len(packages) > 1:
            decl = decls[-1]
            raise AidlError(decl.path, decl.line, 'all files must share one package')

    def kind_of(self, decl: Declaration, ref: TypeRef) -> str:
        """'primitive', 'String', 'List', or the kind of the declared type."""
        if ref.name in PRIMITIVES:
            return 'primitive'
        if ref.name in ('String', 'List'):
            return ref.name
        target = self.decls.get(ref.name)
        visible = ref.qualified or ref.name == decl.name or ref.name in decl.imports
        if target is None or not visible:
            raise AidlError(decl.path, ref.line, "Failed to resolve '%s'" % ref.name)
        return target.kind

    def check_type(self, decl: Declaration, ref: TypeRef, in_parcelable: bool):
        ref.kind = self.kind_of(decl, ref)
        if ref.kind == 'List':
            element = ref.element
            element.kind = self.kind_of(decl, element)
            if ref.is_array:
                raise AidlError(decl.path, ref.line, 'arrays of List are not supported')
            if element.kind not in ('String', 'parcelable') or element.is_array \
                    or element.nullable:
                raise AidlError(decl.path, element.line,
                                'List<%s> is not supported; use an array or List of String '
                                'or a parcelable' % element.name)
        if ref.kind == 'interface':
            if in_parcelable:
                raise AidlError(decl.path, ref.line,
                                'interface fields in parcelables are not supported')
            if ref.is_array:
                raise AidlError(decl.path, ref.line, 'arrays of interfaces are not supported')
        if ref.nullable and ref.kind in ('primitive', 'enum') and not ref.is_array:
            raise AidlError(decl.path, ref.line, '%s cannot be @nullable' % ref.name)

    def check(self) -> List[Declaration]:
        for decl in self.decls.values():
            for name, line in decl.imports.items():
                if name not in self.decls:
                    raise AidlError(decl.path, line, "Couldn't find import for class %s.%s"
                                    % (decl.package, name))
            for field in decl.fields:
                self.check_type(decl, field.type, in_parcelable=True)
                if field.type.kind == 'parcelable' and field.type.name == decl.name \
                        and not field.type.is_array:
                    raise AidlError(decl.path, field.line, 'a parcelable cannot contain itself')
            for method in decl.methods:
                if method.return_type is not None:
                    self.check_type(decl, method.return_type, in_parcelable=False)
                names = set()
                for param in method.params:
                    if param.name in names:
                        raise AidlError(decl.path, param.line, "method '%s' has duplicate "
                                        "argument name '%s'" % (method.name, param.name))
                    names.add(param.name)
                    self.check_type(decl, param.type, in_parcelable=False)
                    self.check_direction(decl, param)
        return list(self.decls.values())

    @staticmethod
    def check_direction(decl: Declaration, param: Param):
        carries_data = param.type.is_array or param.type.kind in ('List', 'parcelable')
        if param.direction == 'inout':
            if not carries_data:
                raise AidlError(decl.path, param.line, "'%s %s' can be an in parameter only"
                                % (param.type.name, param.name))
            raise AidlError(decl.path, param.line, 'inout parameters are not supported')
        if carries_data and not param.direction:
            raise AidlError(decl.path, param.line,
                            '%s %s can be an out type, so it needs "in" or "out"'
                            % (param.type.name, param.name))
        if param.direction == 'out' and not carries_data:
            raise AidlError(decl.path, param.line,
                            '%s %s cannot be "out"; only arrays, lists and parcelables can'
                            % (param.type.name, param.name))
        if not param.direction:
            param.direction = 'in'


def parse_package(paths: List[str]) -> List[Declaration]:
    """Parses and cross-checks the files, in the order given."""
    return Resolver([parse_file(p) for p in paths]).check()
