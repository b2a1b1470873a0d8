#!/usr/bin/env perl
# OAT post-processing of the demo kit.
#   PostProcess3.pl SOURCE TEMP DEVICEPACK PLATFORM
# Reads every raw .oat log in SOURCE, writes the processed log (a header
# naming the device pack and platform, then the log) into TEMP, and moves the
# raw log into SOURCE/processed so that each log is processed once.
use strict;
use warnings;
use File::Copy qw(move);
use File::Path qw(make_path);

my ($source, $temp, $devicePack, $platform) = @ARGV;
die "usage: PostProcess3.pl SOURCE TEMP DEVICEPACK PLATFORM\n" unless defined $platform;
make_path("$source/processed", $temp);
opendir(my $dir, $source) or die "PostProcess3: cannot read $source: $!\n";
my @logs = sort grep { /\.oat$/i && -f "$source/$_" } readdir($dir);
closedir($dir);
for my $log (@logs) {
    open(my $in, '<', "$source/$log") or die "PostProcess3: cannot read $log: $!\n";
    my @lines = <$in>;
    close($in);
    open(my $out, '>', "$temp/$log") or die "PostProcess3: cannot write $log: $!\n";
    print $out "# processed for $platform with $devicePack\n", @lines;
    close($out);
    move("$source/$log", "$source/processed/$log");
}
printf("   PostProcess3: %d log(s) processed\n", scalar(@logs));
