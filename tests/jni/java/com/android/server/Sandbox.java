package com.android.server;

import static org.junit.jupiter.api.Assertions.assertEquals;

import java.io.IOException;
import java.io.UncheckedIOException;
import java.nio.file.Files;
import java.nio.file.LinkOption;
import java.nio.file.Path;
import java.util.Comparator;
import java.util.stream.Stream;

/** The fixed paths of the library, which tests may only touch inside tools/dlp-sandbox. */
final class Sandbox {
    static final Path USERS = Path.of("/data/system/users");
    static final Path DATABASE_DIRECTORY = USERS.resolve("dlp");
    static final Path DATABASE = DATABASE_DIRECTORY.resolve("dlpinfo.db");
    static final Path DEVICE = Path.of("/dev/zmk_dlp");

    private Sandbox() {}

    /** Fails the caller unless /data/system/users lies on the sandbox's private tmpfs. */
    static void requirePrivateUsersDirectory() throws IOException {
        String fileSystem = "none";
        int longestMountPoint = -1;
        try (Stream<String> mounts = Files.lines(Path.of("/proc/self/mountinfo"))) {
            for (String line : (Iterable<String>) mounts::iterator) {
                // Field 5 is the mount point; the file system type follows the " - " separator.
                Path mountPoint = Path.of(line.split(" ")[4]);
                int depth = mountPoint.getNameCount();
                // The later of two mounts at one point hides the earlier.
                if (USERS.startsWith(mountPoint) && depth >= longestMountPoint) {
                    longestMountPoint = depth;
                    fileSystem = line.substring(line.indexOf(" - ") + 3).split(" ")[0];
                }
            }
        }
        assertEquals("tmpfs", fileSystem,
                "run these tests through tools/dlp-sandbox: they write " + USERS);
    }

    /** Leaves no database directory behind, as on a device that never stored a duration. */
    static void removeDatabaseDirectory() throws IOException {
        if (!Files.exists(DATABASE_DIRECTORY, LinkOption.NOFOLLOW_LINKS)) return;
        try (Stream<Path> paths = Files.walk(DATABASE_DIRECTORY)) {
            paths.sorted(Comparator.reverseOrder()).forEach(path -> {
                try {
                    Files.delete(path);
                } catch (IOException e) {
                    throw new UncheckedIOException(e);
                }
            });
        }
    }
}
