package com.android.server;

import static java.nio.charset.StandardCharsets.US_ASCII;
import static org.junit.jupiter.api.Assertions.assertNotNull;
import static org.junit.jupiter.api.Assertions.assertTrue;

import java.io.IOException;
import java.nio.ByteBuffer;
import java.nio.ByteOrder;
import java.nio.file.Files;
import java.nio.file.Path;
import java.util.HexFormat;
import java.util.List;

/** What the device stand-in at /dev/zmk_dlp received, and the failures it is told to give. */
final class DeviceStandIn {
    static final int LOCK_ENABLE = 0x40047801;
    static final int LOCK_DISABLE = 0x40047802;
    static final int EXTENSION_SET = 0x43f07803;

    record Request(int number, byte[] argument) {
        ByteBuffer argumentBuffer() {
            return ByteBuffer.wrap(argument).order(ByteOrder.LITTLE_ENDIAN);
        }
    }

    interface Call {
        void run() throws Exception;
    }

    private final Path state;

    private DeviceStandIn(Path state) {
        this.state = state;
    }

    /** The stand-in mounted by tools/dlp-sandbox --device; fails the caller when there is none. */
    static DeviceStandIn mounted() {
        String state = System.getenv("DLP_DEVICE_STATE");
        assertNotNull(state, "DLP_DEVICE_STATE is not set: run through tools/dlp-sandbox --device");
        assertTrue(Files.exists(Sandbox.DEVICE), Sandbox.DEVICE + " is missing: run with --device");
        return new DeviceStandIn(Path.of(state));
    }

    List<Request> requests() throws IOException {
        Path log = state.resolve("requests");
        if (!Files.exists(log)) return List.of();
        return Files.readAllLines(log, US_ASCII).stream()
                .filter(line -> !line.isBlank())
                .map(DeviceStandIn::parse)
                .toList();
    }

    /** The requests that reached the device while {@code call} ran. */
    List<Request> requestsDuring(Call call) throws Exception {
        int before = requests().size();
        call.run();
        List<Request> after = requests();
        return after.subList(before, after.size());
    }

    String lockState(int id) throws IOException {
        return Files.readString(state.resolve("lock." + id), US_ASCII).strip();
    }

    byte[] extensions(int id) throws IOException {
        return Files.readAllBytes(state.resolve("extensions." + id));
    }

    void fail(int request, int errno) throws IOException {
        Files.writeString(state.resolve("fail"), String.format("0x%08x %d%n", request, errno));
    }

    void stopFailing() throws IOException {
        Files.deleteIfExists(state.resolve("fail"));
    }

    private static Request parse(String line) {
        String[] fields = line.strip().split(" ");
        byte[] argument = fields.length > 1 ? HexFormat.of().parseHex(fields[1]) : new byte[0];
        return new Request(Integer.parseUnsignedInt(fields[0].substring(2), 16), argument);
    }
}
