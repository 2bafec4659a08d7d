import static org.junit.jupiter.api.Assertions.*;

import com.android.server.DLPManagerService;
import com.halvorn.android.zorvat.dlp.XattrManager;
import java.nio.*;
import java.nio.file.*;
import org.junit.jupiter.api.Test;
import org.junit.jupiter.api.io.TempDir;

class NativeMethodsTest {
    @TempDir Path directory;

    @Test
    void fileExpiryTimeComesFromTheAttribute() throws Exception {
        Path stamped = Files.createFile(directory.resolve("stamped.pdf"));
        // Past 2^32, so that a result cut to 32 bits cannot pass.
        ByteBuffer value = ByteBuffer.allocate(16).order(ByteOrder.LITTLE_ENDIAN);
        Files.setAttribute(stamped, "user:zorvat_dlp", value.putLong(5_000_000_000L).clear());
        long expiry = XattrManager.Native_Dlp_GetDLPFileExpiryTime(stamped.toString());
        assertEquals(5_000_000_000L, expiry);
        Path plain = Files.createFile(directory.resolve("plain.pdf"));
        assertEquals(-1L, XattrManager.Native_Dlp_GetDLPFileExpiryTime(plain.toString()));
        assertEquals(-1L, XattrManager.Native_Dlp_GetDLPFileExpiryTime(null));
    }

    @Test
    void administratorSettingsReachTheLibrary() throws Exception {
        assertTrue(DLPManagerService.Native_Dlp_SetDLPExpiry(150, 60));
        assertFalse(DLPManagerService.Native_Dlp_SetDLPExpiry(99, 60));
        assertTrue(DLPManagerService.Native_Dlp_SetDLPExtension(11, "doc,pdf"));
        assertFalse(DLPManagerService.Native_Dlp_SetDLPExtension(11, null));
        assertEquals("doc,pdf", deviceState("extensions.11"));
        assertTrue(DLPManagerService.Native_Dlp_LockDLP(12));
        assertEquals("1", deviceState("lock.12"));
        assertTrue(DLPManagerService.Native_Dlp_UnlockDLP(12));
        assertEquals("0", deviceState("lock.12"));
        // A device that refuses every request: each bridge says false.
        Files.writeString(Path.of(System.getenv("DLP_DEVICE_STATE"), "fail"),
                "0x40047801 1\n0x40047802 1\n0x43f07803 1\n");
        assertFalse(DLPManagerService.Native_Dlp_LockDLP(12));
        assertFalse(DLPManagerService.Native_Dlp_UnlockDLP(12));
        assertFalse(DLPManagerService.Native_Dlp_SetDLPExtension(11, "doc"));
    }

    /** What the device stand-in keeps of the requests it received. */
    private static String deviceState(String name) throws Exception {
        return Files.readString(Path.of(System.getenv("DLP_DEVICE_STATE"), name));
    }
}
