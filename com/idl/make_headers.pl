# Makes of the IDL what C++ and C programs include, and the manifest for programs that use the component without
# registering it.
#
#   perl make_headers.pl IDL cpp|c > zkusb_monitor.h
#   perl make_headers.pl IDL manifest x86|amd64 DLL > ZKUsbMonitor.Assembly.manifest
#   perl make_headers.pl IDL ids > identifiers.md
#
# It reads the IDL as it stands here, not any IDL: an interface derives from IUnknown, a method answers an HRESULT, each
# statement ends on the last line it begins. What it does not understand stops it with the line. A comment right above
# an interface, a method or an enumeration goes along.
use strict;
use warnings;

my ($idl, $kind, @more) = @ARGV;
die "make_headers.pl IDL cpp|c|ids|manifest [WIDTH DLL]\n" unless defined $kind && $kind =~ /^(cpp|c|ids|manifest)$/;
open my $file, '<', $idl or die "$idl: $!\n";
binmode STDOUT;

my (@order, %interface, @enums, @classes, %library);
my ($interface, $in_library, $class, @comment, $text) = (undef, 0, undef);
$text = '';
my %types = ('long' => 'LONG', 'unsigned long' => 'ULONG', 'unsigned char' => 'BYTE');

sub Uuid { $_[0] =~ /uuid\(([0-9A-F-]{36})\)/ ? $1 : die "$idl:$.: without uuid: $_[0]\n" }

# "[in] enum TDeviceEventType changeStatus" as a type and a name.
sub Parameter {
  my $parameter = shift;
  $parameter =~ s/\[[^\]]*\]//;
  $parameter =~ s/\benum\b//;
  my ($type, $stars, $name) = $parameter =~ /^\s*([\w ]+?)\s*(\**)\s*(\w+)\s*$/ or die "$idl:$.: $parameter\n";
  return {type => ($types{$type} // $type) . $stars, name => $name};
}

sub TakeComment { my @taken = @comment; @comment = (); return \@taken }

while (my $line = <$file>) {
  $line =~ s/\r?\n$//;
  if ($line =~ m{^\s*//\s?(.*)}) { push @comment, $1; next }
  if ($line =~ /^\s*$/) { @comment = () if $text eq ''; next }
  $text .= ($text eq '' ? '' : ' ') . $line =~ s/^\s+//r;
  next unless $line =~ /[;{}]\s*$/;
  my $statement = $text;
  $text = '';
  if ($statement =~ /^import|^importlib/) {
    @comment = ();
  } elsif ($statement =~ /^(dis)?(p?)interface (\w+);$/) {
    @comment = ();  # named ahead, or in the library's list
  } elsif ($statement =~ /^(\[.*\]) interface (\w+) : IUnknown \{$/) {
    $interface = {name => $2, uuid => Uuid($1), methods => [], comment => TakeComment()};
    push @order, $interface;
  } elsif ($interface && $statement =~ /^\[(.*?)\] HRESULT (\w+)\((.*)\);$/) {
    my ($attributes, $name, $list) = ($1, $2, $3);
    $name = "get_$name" if $attributes =~ /\bpropget\b/;
    push @{$interface->{methods}}, {name => $name, parameters => [map { Parameter($_) } split /,(?![^\[]*\])/, $list],
                                    comment => TakeComment()};
  } elsif (!$in_library && $statement =~ /^(\[.*\] )?enum (\w+) \{(.*)$/) {
    my $enum = {name => $2, alias => $2, comment => TakeComment(), values => []};
    while (defined($line = <$file>) && $line !~ /^\};/) {
      $line =~ /^\s*(\w+) = (\d+),?$/ or die "$idl:$.: $line";
      push @{$enum->{values}}, "$1 = $2";
    }
    push @enums, $enum;
    push @order, $enum;
  } elsif ($statement =~ /^typedef \[.*\] enum (\w+) (\w+);$/) {
    my ($enum) = grep { $_->{name} eq $1 } @enums or die "$idl:$.: $statement\n";
    $enum->{alias} = $2;
    @comment = ();
  } elsif ($statement =~ /^(\[.*\]) library (\w+) \{$/) {
    %library = (name => $2, uuid => Uuid($1));
    $1 =~ /version\((\d+\.\d+)\)/ and $library{version} = $1;
    $in_library = 1;
    @comment = ();
  } elsif ($in_library && $statement =~ /^(\[.*\]) dispinterface (\w+) \{$/) {
    $library{events} = {name => $2, uuid => Uuid($1)};
    @comment = ();
  } elsif ($in_library && $statement =~ /^(\[.*\]) coclass (\w+) \{$/) {
    push @classes, {name => $2, uuid => Uuid($1)};
    @comment = ();
  } elsif ($in_library && $statement =~ /^(enum \w+|interface \w+|\[default(, source)?\] \w+ \w+);$/) {
    @comment = ();
  } elsif ($statement eq '}' || $statement eq '};') {
    $interface = undef;
  } else {
    die "$idl:$.: not understood: $statement\n";
  }
}
my @interfaces = grep { exists $_->{methods} } @order;
die "$idl: incomplete\n" unless @interfaces && @enums && @classes && $library{events} && $library{version};

sub Numbers {
  my ($a, $b, $c, $d, $e) = split /-/, shift;
  return join ', ', "0x$a", "0x$b", "0x$c", map { "0x$_" } "$d$e" =~ /../g;
}
sub Constant { my ($n, @n) = (0, split /, /, Numbers(shift)); return join(', ', @n[0 .. 2]) . ', {' . join(', ', @n[3 .. 10]) . '}' }
sub Comment { my ($indent, $lines) = @_; return join '', map { $_ eq '' ? "$indent//\n" : "$indent// $_\n" } @$lines }
# C has only one kind of comment that every compiler takes.
sub CComment { my ($indent, $lines) = @_; return @$lines ? "$indent/* " . join("\n$indent * ", @$lines) . " */\n" : '' }

# Breaks a declaration behind commas where it is too long.
sub Wrapped {
  my ($indent, $head, @list) = @_;
  my $line = $indent . $head;
  my $result = '';
  for my $i (0 .. $#list) {
    my $piece = $list[$i];
    if (length($line) + length($piece) > 98 && $line !~ /^\s+$/) {
      $result .= $line =~ s/ $//r . "\n";
      $line = "$indent    ";
    }
    $line .= $piece . ($i < $#list ? ' ' : '');
  }
  return $result . $line . "\n";
}

sub ParameterList {
  my ($first, $end, @parameters) = @_;
  my @texts = ((defined $first ? $first : ()), map { "$_->{type} $_->{name}" } @parameters);
  return $end unless @texts;
  $texts[$_] .= $_ < $#texts ? ',' : $end for 0 .. $#texts;
  return @texts;
}

my @rules = (
  'Rules that hold for every method unless its comment says otherwise:',
  '- The result is an HRESULT; a failed call returns nothing to release.',
  '- A null out pointer gives E_POINTER (for some numbers: E_INVALIDARG).',
  '- The caller frees a BSTR with SysFreeString, and releases an interface.',
  '- Text properties return E_OUTOFMEMORY when memory runs out, or throw an exception that derives',
  '  from std::exception.',
  '- Nodes are snapshots: a node answers from the tree it was taken from, also after that tree has',
  '  been replaced by a newer one.',
  '- Call from the multithreaded apartment. The type library gives no parameter directions for three',
  '  methods (InSubtreeDevicesOfType, FirstChildOfType, PortDevicesWithVolume): through a proxy they',
  '  return S_OK but no result.');

sub Ids {
  my $out = '';
  $out .= "ZKUM_ID(LIBID_$library{name}, " . Constant($library{uuid}) . ")\n";
  $out .= "ZKUM_ID(CLSID_$_->{name}, " . Constant($_->{uuid}) . ")\n" for @classes;
  $out .= "ZKUM_ID(DIID_$library{events}{name}, " . Constant($library{events}{uuid}) . ")\n";
  $out .= "ZKUM_ID(IID_$_->{name}, " . Constant($_->{uuid}) . ")\n" for @interfaces;
  return $out;
}

sub Cpp {
  my $out = "// The interfaces of ZKUsbMonitor for C++ programs, C++11 and later. Made from zkusb_monitor.idl: do not edit.\n//\n"
    . Comment('', \@rules) . "\n// clang-format off\n"
    . "#ifndef ZKUSB_MONITOR_H\n#define ZKUSB_MONITOR_H\n\n#ifndef __cplusplus\n#error \"C programs include zkusb_monitor_c.h\"\n#endif\n\n"
    . "#include <windows.h>\n#include <ocidl.h>\n\n"
    . "// Constants that every file of a program may define, and the linker keeps once.\n"
    . "#define ZKUM_ID(name, ...) extern \"C\" const GUID DECLSPEC_SELECTANY name = {__VA_ARGS__};\n"
    . Ids() . "#undef ZKUM_ID\n\n"
    . "// Compilers without a uuid of their own for a type get it from the system's headers.\n"
    . "#ifdef __CRT_UUID_DECL\n#define ZKUM_UUID(type, ...) __CRT_UUID_DECL(type, __VA_ARGS__)\n#else\n#define ZKUM_UUID(type, ...)\n#endif\n\n";
  $out .= "struct $_->{name};\n" for @interfaces;
  for my $entry (@order) {
    $out .= "\n" . Comment('', $entry->{comment});
    if ($entry->{values}) {
      $out .= "enum $entry->{name} : int {\n" . join('', map { "  $_,\n" } @{$entry->{values}}) . "};\n";
      $out .= "typedef $entry->{name} $entry->{alias};\n" if $entry->{alias} ne $entry->{name};
      next;
    }
    $out .= "MIDL_INTERFACE(\"$entry->{uuid}\") $entry->{name} : public IUnknown {\n";
    $out .= Comment('  ', $_->{comment}) . Wrapped('  ', "virtual HRESULT STDMETHODCALLTYPE $_->{name}(",
                                                   ParameterList(undef, ') = 0;', @{$_->{parameters}})) for @{$entry->{methods}};
    $out .= "};\nZKUM_UUID($entry->{name}, " . Numbers($entry->{uuid}) . ")\n";
  }
  $out .= "\n// The classes and the interface for events, for __uuidof alone.\n";
  for my $entry (@classes) {
    $out .= "class DECLSPEC_UUID(\"$entry->{uuid}\") $entry->{name};\nZKUM_UUID($entry->{name}, " . Numbers($entry->{uuid}) . ")\n";
  }
  my $events = $library{events};
  $out .= "struct DECLSPEC_UUID(\"$events->{uuid}\") $events->{name};\nZKUM_UUID($events->{name}, " . Numbers($events->{uuid}) . ")\n";
  return $out . "\n#undef ZKUM_UUID\n\n#endif\n";
}

sub C {
  my $out = "/* The interfaces of ZKUsbMonitor for C programs. Made from zkusb_monitor.idl: do not edit.\n *\n * "
    . join("\n * ", @rules) . " */\n\n/* clang-format off */\n"
    . "#ifndef ZKUSB_MONITOR_C_H\n#define ZKUSB_MONITOR_C_H\n\n#if defined(__cplusplus) && !defined(CINTERFACE)\n#error \"C++ programs include zkusb_monitor.h\"\n#endif\n\n"
    . "#include <windows.h>\n#include <ocidl.h>\n\n"
    . "/* Constants that every file of a program may define, and the linker keeps once. */\n"
    . "#define ZKUM_ID(name, ...) const GUID DECLSPEC_SELECTANY name = {__VA_ARGS__};\n"
    . Ids() . "#undef ZKUM_ID\n\n";
  $out .= "typedef struct $_->{name} $_->{name};\n" for @interfaces;
  for my $entry (@order) {
    $out .= "\n" . CComment('', $entry->{comment});
    if ($entry->{values}) {
      $out .= "typedef enum $entry->{name} {\n" . join(",\n", map { "  $_" } @{$entry->{values}}) . "\n} $entry->{alias};\n";
      next;
    }
    my $name = $entry->{name};
    $out .= "typedef struct ${name}Vtbl {\n"
      . "  HRESULT(STDMETHODCALLTYPE* QueryInterface)($name* This, REFIID riid, void** ppvObject);\n"
      . "  ULONG(STDMETHODCALLTYPE* AddRef)($name* This);\n  ULONG(STDMETHODCALLTYPE* Release)($name* This);\n";
    $out .= CComment('  ', $_->{comment}) . Wrapped('  ', "HRESULT(STDMETHODCALLTYPE* $_->{name})(",
                                                    ParameterList("$name* This", ');', @{$_->{parameters}})) for @{$entry->{methods}};
    $out .= "} ${name}Vtbl;\nstruct $name {\n  CONST_VTBL ${name}Vtbl* lpVtbl;\n};\n#ifdef COBJMACROS\n";
    for my $method ({name => 'QueryInterface', parameters => [{name => 'riid'}, {name => 'ppvObject'}]},
                    {name => 'AddRef', parameters => []}, {name => 'Release', parameters => []}, @{$entry->{methods}}) {
      my $list = join ', ', 'This', map { $_->{name} } @{$method->{parameters}};
      $out .= "#define ${name}_$method->{name}($list) ((This)->lpVtbl->$method->{name}($list))\n";
    }
    $out .= "#endif\n";
  }
  return $out . "\n#endif\n";
}

sub Manifest {
  my ($width, $dll) = @_;
  die "manifest WIDTH DLL\n" unless defined $dll;
  my $out = qq(<?xml version="1.0" encoding="UTF-8" standalone="yes"?>\n<!-- Made from zkusb_monitor.idl. Beside $dll it stands in for the registration. -->\n)
    . qq(<assembly xmlns="urn:schemas-microsoft-com:asm.v1" manifestVersion="1.0">\n)
    . qq(  <assemblyIdentity type="win32" name="ZKUsbMonitor.Assembly" version="$library{version}.0.0" processorArchitecture="$width"/>\n)
    . qq(  <file name="$dll">\n);
  $out .= qq(    <comClass clsid="{$_->{uuid}}" threadingModel="Free" tlbid="{$library{uuid}}" progid=")
    . ProgId($_->{name}) . qq(.1" description="$_->{name} Class">\n      <progid>)
    . ProgId($_->{name}) . qq(</progid>\n    </comClass>\n) for @classes;
  $out .= qq(    <typelib tlbid="{$library{uuid}}" version="$library{version}" helpdir="" resourceid="1"/>\n  </file>\n);
  # Sinks, as the registration of a type library has it.
  $out .= qq(  <comInterfaceExternalProxyStub iid="{$library{events}{uuid}}" name="$library{events}{name}" tlbid="{$library{uuid}}" )
    . qq(proxyStubClsid32="{00020420-0000-0000-C000-000000000046}" baseInterface="{00020400-0000-0000-C000-000000000046}"/>\n);
  # Each is carried between apartments by the system's own proxy, which reads the type library.
  $out .= qq(  <comInterfaceExternalProxyStub iid="{$_->{uuid}}" name="$_->{name}" tlbid="{$library{uuid}}" )
    . qq(proxyStubClsid32="{00020424-0000-0000-C000-000000000046}" baseInterface="{00000000-0000-0000-C000-000000000046}"/>\n) for @interfaces;
  return $out . "</assembly>\n";
}

sub ProgId { return 'KelvoUsbMonitor.' . $_[0] =~ s/^ZKUM//r }

sub IdList {
  my $out = "# Identifiers\n\nMade from `com/zkusb_monitor.idl` by `scripts/make-headers.sh`: do not edit.\n\n"
    . "| class | ProgID | with version | CLSID |\n|---|---|---|---|\n";
  $out .= "| `$_->{name}` | `" . ProgId($_->{name}) . '` | `' . ProgId($_->{name}) . ".1` | `{$_->{uuid}}` |\n" for @classes;
  $out .= "\nBoth have the threading model \"Free\".\n\n| interface | IID |\n|---|---|\n";
  $out .= "| `$_->{name}` | `{$_->{uuid}}` |\n" for @interfaces;
  return $out . "| `$library{events}{name}`, the events | `{$library{events}{uuid}}` |\n"
    . "\n| | |\n|---|---|\n| type library, version $library{version} | `{$library{uuid}}` |\n"
    . "| application (AppID) | `{A0C53575-7F3D-4FF2-B5A7-BFA873492510}` |\n";
}

print $kind eq 'ids' ? IdList() : $kind eq 'cpp' ? Cpp() : $kind eq 'c' ? C() : Manifest(@more);
