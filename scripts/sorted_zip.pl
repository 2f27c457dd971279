# The files below a folder as a zip whose bytes depend on nothing but their names and contents and on one time, in
# seconds since 1970: perl sorted_zip.pl FOLDER TIME ZIP
use strict;
use warnings;
use File::Find;
use IO::Compress::Zip qw($ZipError ZIP_CM_DEFLATE);

my ($folder, $time, $zip) = @ARGV;
my @names;
find({no_chdir => 1, wanted => sub { push @names, substr($_, length($folder) + 1) if -f }}, $folder);
my $out;
for my $name (sort @names) {
  my %entry = (Name => $name, Time => $time, Minimal => 1, Method => ZIP_CM_DEFLATE);
  if ($out) {
    $out->newStream(%entry);
  } else {
    $out = IO::Compress::Zip->new($zip, %entry) or die "$zip: $ZipError\n";
  }
  open my $file, '<:raw', "$folder/$name" or die "$name: $!\n";
  local $/ = undef;
  $out->print(scalar <$file>) // die "$zip: $ZipError\n";
}
$out->close or die "$zip: $ZipError\n";
