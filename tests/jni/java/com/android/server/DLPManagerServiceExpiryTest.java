package com.android.server;

import static java.nio.charset.StandardCharsets.UTF_8;
import static org.junit.jupiter.api.Assertions.assertEquals;
import static org.junit.jupiter.api.Assertions.assertFalse;
import static org.junit.jupiter.api.Assertions.assertTrue;

import java.io.IOException;
import java.nio.file.Files;
import java.util.List;
import org.junit.jupiter.api.BeforeAll;
import org.junit.jupiter.api.BeforeEach;
import org.junit.jupiter.api.Test;
import org.junit.jupiter.params.ParameterizedTest;
import org.junit.jupiter.params.provider.CsvSource;
import org.junit.jupiter.params.provider.ValueSource;

class DLPManagerServiceExpiryTest {
    @BeforeAll
    static void requireSandbox() throws IOException {
        Sandbox.requirePrivateUsersDirectory();
    }

    @BeforeEach
    void startWithoutDatabase() throws IOException {
        Sandbox.removeDatabaseDirectory();
    }

    /** The table's rows as "Id|Time", read by the sqlite3 shell. */
    private static List<String> storedRows() throws IOException, InterruptedException {
        if (!Files.exists(Sandbox.DATABASE)) return List.of();
        String shell = System.getProperty("dlp.sqlite3", "sqlite3");
        Process query = new ProcessBuilder(shell, "-readonly", "-batch", Sandbox.DATABASE.toString(),
                "SELECT Id, Time FROM dlpInfo ORDER BY Id, Time;")
                .redirectErrorStream(true)
                .start();
        String output = new String(query.getInputStream().readAllBytes(), UTF_8);
        assertEquals(0, query.waitFor(), shell + " failed: " + output);
        return output.lines().toList();
    }

    // Both ends of the id range; durations of either sign reach the table unchanged.
    @ParameterizedTest
    @CsvSource({"100, 3600", "199, 0", "150, -86400", "120, 2147483647"})
    void durationIsStoredAndReportedTrue(int id, int seconds) throws Exception {
        assertTrue(DLPManagerService.Native_Dlp_SetDLPExpiry(id, seconds));

        assertEquals(List.of(id + "|" + seconds), storedRows());
    }

    @Test
    void laterDurationReplacesTheContainersRow() throws Exception {
        assertTrue(DLPManagerService.Native_Dlp_SetDLPExpiry(100, 3600));
        assertTrue(DLPManagerService.Native_Dlp_SetDLPExpiry(101, 60));
        assertTrue(DLPManagerService.Native_Dlp_SetDLPExpiry(100, 7200));

        assertEquals(List.of("100|7200", "101|60"), storedRows());
    }

    @ParameterizedTest
    @ValueSource(ints = {99, 200, 0, -100, Integer.MIN_VALUE})
    void idOutsideTheContainerRangeIsRefused(int id) throws Exception {
        assertFalse(DLPManagerService.Native_Dlp_SetDLPExpiry(id, 3600));

        assertEquals(List.of(), storedRows());
    }

    @Test
    void storeThatCannotBeWrittenIsReportedFalse() throws Exception {
        // A plain file where the database directory belongs: no database can be created.
        Files.createFile(Sandbox.DATABASE_DIRECTORY);

        assertFalse(DLPManagerService.Native_Dlp_SetDLPExpiry(100, 3600));
    }
}
