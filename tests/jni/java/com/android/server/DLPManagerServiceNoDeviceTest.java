package com.android.server;

import static org.junit.jupiter.api.Assertions.assertFalse;

import java.io.IOException;
import java.nio.file.Files;
import org.junit.jupiter.api.BeforeAll;
import org.junit.jupiter.api.Tag;
import org.junit.jupiter.api.Test;

@Tag("no-device")
class DLPManagerServiceNoDeviceTest {
    @BeforeAll
    static void requireMissingDevice() throws IOException {
        Sandbox.requirePrivateUsersDirectory();
        assertFalse(Files.exists(Sandbox.DEVICE), Sandbox.DEVICE + " exists: run without --device");
    }

    @Test
    void lockAndUnlockFail() {
        assertFalse(DLPManagerService.Native_Dlp_LockDLP(1));
        assertFalse(DLPManagerService.Native_Dlp_UnlockDLP(1));
    }

    @Test
    void extensionListCannotBeHandedOver() {
        assertFalse(DLPManagerService.Native_Dlp_SetDLPExtension(1, "doc,pdf"));
    }
}
