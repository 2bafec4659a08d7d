package com.android.server;

import static com.android.server.DeviceStandIn.EXTENSION_SET;
import static com.android.server.DeviceStandIn.LOCK_DISABLE;
import static com.android.server.DeviceStandIn.LOCK_ENABLE;
import static java.nio.charset.StandardCharsets.UTF_8;
import static org.junit.jupiter.api.Assertions.assertArrayEquals;
import static org.junit.jupiter.api.Assertions.assertEquals;
import static org.junit.jupiter.api.Assertions.assertFalse;
import static org.junit.jupiter.api.Assertions.assertTrue;

import com.android.server.DeviceStandIn.Request;
import java.io.IOException;
import java.nio.ByteBuffer;
import java.util.Arrays;
import java.util.List;
import java.util.stream.Stream;
import org.junit.jupiter.api.AfterEach;
import org.junit.jupiter.api.BeforeAll;
import org.junit.jupiter.api.Nested;
import org.junit.jupiter.api.Tag;
import org.junit.jupiter.api.Test;
import org.junit.jupiter.params.ParameterizedTest;
import org.junit.jupiter.params.provider.Arguments;
import org.junit.jupiter.params.provider.MethodSource;

@Tag("device")
class DLPManagerServiceDeviceTest {
    private static final int EXTENSION_TEXT_OFFSET = 4;
    private static final int EXTENSION_TEXT_FILLED = 1000;

    private static DeviceStandIn device;

    @BeforeAll
    static void requireDevice() throws IOException {
        Sandbox.requirePrivateUsersDirectory();
        device = DeviceStandIn.mounted();
    }

    @AfterEach
    void stopFailing() throws IOException {
        device.stopFailing();
    }

    private static Request onlyRequest(List<Request> sent) {
        assertEquals(1, sent.size(), "requests sent to the device");
        return sent.get(0);
    }

    private static void assertLockRequest(Request request, int number, int id) {
        assertEquals(number, request.number(), "request number");
        assertEquals(4, request.argument().length, "argument size");
        assertEquals(id, request.argumentBuffer().getInt(0), "id");
    }

    @Nested
    class ExtensionList {
        /** An extension list of exactly {@code length} bytes. */
        private static String listOfLength(int length) {
            StringBuilder list = new StringBuilder();
            for (int i = 0; list.length() < length; i++) list.append("ext").append(i).append(',');
            return list.substring(0, length);
        }

        static Stream<Arguments> acceptedLists() {
            return Stream.of(Arguments.of(11, "doc,docx,pdf,hwp"),
                    Arguments.of(-3, "pdf"),
                    Arguments.of(12, ""),
                    Arguments.of(13, "dokument,präsentation"),
                    Arguments.of(14, listOfLength(1000)),
                    // 500 characters, 1000 bytes: the limit counts bytes.
                    Arguments.of(15, "ü".repeat(500)));
        }

        @ParameterizedTest
        @MethodSource("acceptedLists")
        void listReachesTheDeviceAsOneRecord(int id, String list) throws Exception {
            byte[] text = list.getBytes(UTF_8);

            Request request = onlyRequest(device.requestsDuring(
                    () -> assertTrue(DLPManagerService.Native_Dlp_SetDLPExtension(id, list))));

            assertEquals(EXTENSION_SET, request.number(), "request number");
            assertEquals(1008, request.argument().length, "record size");
            ByteBuffer record = request.argumentBuffer();
            assertEquals(id, record.getInt(0), "id");
            byte[] received = Arrays.copyOfRange(
                    request.argument(), EXTENSION_TEXT_OFFSET, EXTENSION_TEXT_OFFSET + text.length);
            assertArrayEquals(text, received, "text");
            for (int i = EXTENSION_TEXT_OFFSET + text.length;
                    i < EXTENSION_TEXT_OFFSET + EXTENSION_TEXT_FILLED; i++) {
                assertEquals(0, record.get(i), "byte " + i + " after the text");
            }
        }

        @Test
        void laterListReplacesTheEarlierOne() throws Exception {
            assertTrue(DLPManagerService.Native_Dlp_SetDLPExtension(20, "doc,docx,xls,xlsx"));
            assertTrue(DLPManagerService.Native_Dlp_SetDLPExtension(20, "pdf"));

            assertArrayEquals("pdf".getBytes(UTF_8), device.extensions(20));
        }

        static Stream<String> overlongLists() {
            // 1001 bytes; and 501 characters that take 1002 bytes.
            return Stream.of(listOfLength(1001), "ü".repeat(501));
        }

        @ParameterizedTest
        @MethodSource("overlongLists")
        void overlongListIsRefusedWithoutARequest(String list) throws Exception {
            List<Request> sent = device.requestsDuring(
                    () -> assertFalse(DLPManagerService.Native_Dlp_SetDLPExtension(21, list)));

            assertEquals(List.of(), sent);
        }

        @Test
        void nullListIsRefusedWithoutARequest() throws Exception {
            List<Request> sent = device.requestsDuring(
                    () -> assertFalse(DLPManagerService.Native_Dlp_SetDLPExtension(22, null)));

            assertEquals(List.of(), sent);
        }
    }

    @Nested
    class Lock {
        @Test
        void lockThenUnlockSwitchesTheDevice() throws Exception {
            Request lock = onlyRequest(
                    device.requestsDuring(() -> assertTrue(DLPManagerService.Native_Dlp_LockDLP(42))));
            assertLockRequest(lock, LOCK_ENABLE, 42);
            assertEquals("1", device.lockState(42));

            Request unlock = onlyRequest(device.requestsDuring(
                    () -> assertTrue(DLPManagerService.Native_Dlp_UnlockDLP(42))));
            assertLockRequest(unlock, LOCK_DISABLE, 42);
            assertEquals("0", device.lockState(42));
        }

        // Every byte differs, so a swapped or cut id shows.
        @Test
        void idReachesTheDeviceWhole() throws Exception {
            int id = 0x12345678;

            Request lock = onlyRequest(
                    device.requestsDuring(() -> assertTrue(DLPManagerService.Native_Dlp_LockDLP(id))));
            Request unlock = onlyRequest(device.requestsDuring(
                    () -> assertTrue(DLPManagerService.Native_Dlp_UnlockDLP(id))));

            byte[] littleEndian = {0x78, 0x56, 0x34, 0x12};
            assertArrayEquals(littleEndian, lock.argument(), "lock argument");
            assertArrayEquals(littleEndian, unlock.argument(), "unlock argument");
        }
    }

    @Nested
    class RefusedRequest {
        private static final int EIO = 5;

        @Test
        void refusedLockIsReportedFalse() throws Exception {
            device.fail(LOCK_ENABLE, EIO);

            assertFalse(DLPManagerService.Native_Dlp_LockDLP(50));
        }

        @Test
        void refusedUnlockIsReportedFalse() throws Exception {
            assertTrue(DLPManagerService.Native_Dlp_LockDLP(51));
            device.fail(LOCK_DISABLE, EIO);

            assertFalse(DLPManagerService.Native_Dlp_UnlockDLP(51));
        }

        @Test
        void refusedExtensionListIsReportedFalse() throws Exception {
            device.fail(EXTENSION_SET, EIO);

            assertFalse(DLPManagerService.Native_Dlp_SetDLPExtension(52, "pdf"));
        }
    }
}
