# Takes the time of compilation out of a type library, so that the same text gives the same bytes.
# The compiler writes it twice, as text and behind that as seconds, and has no switch for it.
use strict;
use warnings;

my ($file) = @ARGV;
open(my $library, '+<:raw', $file) or die "$file: $!\n";
my $bytes = do { local $/; <$library> };
my $stamped =
  $bytes =~ s/(Created by WIDL version \S+ at ).{24}(\n\0?W*\x13\0).{4}/$1Thu Jan  1 00:00:00 1970$2\0\0\0\0/gs;
$stamped == 1 or die "$file: no time of compilation found\n";
seek($library, 0, 0);
print $library $bytes;
close($library) or die "$file: $!\n";
