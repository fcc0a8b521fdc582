// node-opcua's own client, subscribed to the benchmark's items as the Maroset client is:
// one subscription, N monitored items "ns=<test namespace>;s=Bench.K", sampling and publishing
// at the same rate, queue size 1. Counts the values it is handed for a while and prints
// {"values": N, "cpuUs": microseconds of processor time this process used meanwhile}.
//   node client_bench.js ENDPOINT ITEMS RATE_MS DURATION_MS
const opcua = require("node-opcua");

async function main() {
    const [endpoint, items, rate, duration] = [process.argv[2], Number(process.argv[3]),
        Number(process.argv[4]), Number(process.argv[5])];
    const client = opcua.OPCUAClient.create({ endpointMustExist: false,
        securityMode: opcua.MessageSecurityMode.None, securityPolicy: opcua.SecurityPolicy.None });
    await client.connect(endpoint);
    const session = await client.createSession();
    const nsArray = await session.readNamespaceArray();
    const ns = nsArray.indexOf("urn:maroset:test");
    const subscription = await session.createSubscription2({
        requestedPublishingInterval: rate, requestedMaxKeepAliveCount: 20,
        requestedLifetimeCount: 60, publishingEnabled: true });
    let values = 0;
    const group = await subscription.monitorItems(
        Array.from({ length: items }, (_, k) => ({ nodeId: `ns=${ns};s=Bench.${k}`,
            attributeId: opcua.AttributeIds.Value })),
        { samplingInterval: rate, queueSize: 1, discardOldest: true },
        opcua.TimestampsToReturn.Neither);
    group.on("changed", () => { ++values; });
    await new Promise((r) => setTimeout(r, 1000));  // the first full report is not counted
    values = 0;
    const before = process.cpuUsage();
    await new Promise((r) => setTimeout(r, duration));
    const used = process.cpuUsage(before);
    const counted = values;
    console.log(JSON.stringify({ values: counted, cpuUs: used.user + used.system }));
    await subscription.terminate();
    await session.close();
    await client.disconnect();
    process.exit(0);
}

main().catch((e) => { console.error(e.message); process.exit(1); });
