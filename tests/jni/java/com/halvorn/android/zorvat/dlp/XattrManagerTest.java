package com.halvorn.android.zorvat.dlp;

import static org.junit.jupiter.api.Assertions.assertEquals;

import java.io.IOException;
import java.nio.ByteBuffer;
import java.nio.ByteOrder;
import java.nio.file.Files;
import java.nio.file.Path;
import org.junit.jupiter.api.Test;
import org.junit.jupiter.api.io.TempDir;
import org.junit.jupiter.params.ParameterizedTest;
import org.junit.jupiter.params.provider.ValueSource;

class XattrManagerTest {
    @TempDir Path directory;

    private static void protect(Path file, long expiry) throws IOException {
        ByteBuffer value = ByteBuffer.allocate(16).order(ByteOrder.LITTLE_ENDIAN);
        // The second half is reserved: fill it so that a reader looking there gets it wrong.
        value.putLong(expiry).putLong(-1L).flip();
        Files.setAttribute(file, "user:zorvat_dlp", value);
    }

    // Past 2^31 and past 2^32 as well, so that a result cut to 32 bits cannot pass.
    @ParameterizedTest
    @ValueSource(longs = {1L, 1_700_000_000L, 4_102_444_800L, 253_402_300_799L})
    void protectedFileGivesItsExpiry(long expiry) throws IOException {
        Path file = Files.createFile(directory.resolve("report.pdf"));
        protect(file, expiry);

        assertEquals(expiry, XattrManager.Native_Dlp_GetDLPFileExpiryTime(file.toString()));
    }

    @Test
    void unprotectedOrMissingFileGivesMinusOne() throws IOException {
        Path plain = Files.createFile(directory.resolve("notes.txt"));

        assertEquals(-1L, XattrManager.Native_Dlp_GetDLPFileExpiryTime(plain.toString()));
        assertEquals(-1L,
                XattrManager.Native_Dlp_GetDLPFileExpiryTime(
                        directory.resolve("missing.pdf").toString()));
    }

    @Test
    void nullPathGivesMinusOneWithoutThrowing() {
        assertEquals(-1L, XattrManager.Native_Dlp_GetDLPFileExpiryTime(null));
    }
}
