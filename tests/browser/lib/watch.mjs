// What must never happen on the page, whatever a test does: errors in the console, exceptions, violations of the
// content-security policy, requests to another host.

// Chromium's own line about an answer of 400 and above, or about none. It is no fault of the page when the server is
// made to refuse or to vanish; what the page makes of it is what the tests look at.
const REFUSED = /^Failed to load resource: /;
// What Chromium says of a file when nobody is there to answer, or is no more: what becomes of a connection depends on
// the moment at which the server goes.
const NOBODY_THERE =
    /^Failed to load resource: net::ERR_(CONNECTION_(REFUSED|RESET|CLOSED)|SOCKET_NOT_CONNECTED|EMPTY_RESPONSE)$/;

export class Watch {
    constructor(base) {
        this.host = new URL(base).host;
        this.lines = [];
        this.faults = [];
        this.requests = [];
        this.refused = new Set();
        this.serverMayGo = false;
    }

    // For tests that take the server away: only then may one of the page's own files be missed.
    expectServerGone() {
        this.serverMayGo = true;
    }

    async attach(context) {
        await context.exposeBinding("reportViolation", (source, text) => this.fault(`violation of the policy: ${text}`));
        await context.addInitScript(() => {
            document.addEventListener("securitypolicyviolation", (event) => {
                window.reportViolation(`${event.violatedDirective} ${event.blockedURI} ${event.sourceFile}:` +
                    `${event.lineNumber} ${event.sample}`);
            });
        });
        context.on("request", (request) => this.sawRequest(request));
        context.on("response", (response) => response.status() >= 400 && this.refused.add(response.url()));
        context.on("requestfailed", (request) => this.refused.add(request.url()));
        context.on("console", (message) => this.sawLine(message));
        context.on("weberror", (error) => this.fault(`exception: ${error.error().stack ?? error.error()}`));
    }

    sawRequest(request) {
        const url = new URL(request.url());
        this.requests.push(request);
        if (!["data:", "blob:"].includes(url.protocol) && url.host !== this.host) {
            this.fault(`request to another host: ${request.url()}`);
        }
    }

    sawLine(message) {
        const line = `${message.type()}: ${message.text()}`;
        this.lines.push(line);
        if (message.type() === "error" && !this.isRefusal(message)) {
            this.fault(`console: ${message.text()} (${message.location().url}:${message.location().lineNumber})`);
        }
    }

    isRefusal(message) {
        const url = message.location().url;
        const path = url ? new URL(url).pathname : "";
        return (REFUSED.test(message.text()) && /^\/(session|webapi)(\/|$)/.test(path)) ||
            (this.serverMayGo && NOBODY_THERE.test(message.text()) && /^\/assets\//.test(path));
    }

    fault(text) {
        this.faults.push(text);
        this.lines.push(`FAULT ${text}`);
    }

    judge() {
        if (this.faults.length > 0) {
            throw new Error(`the page did what it never may:\n  ${[...new Set(this.faults)].join("\n  ")}`);
        }
    }
}
