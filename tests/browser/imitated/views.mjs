// The views of the page and small words for looking at them.

import {errorOf} from "../lib/catalogue.mjs";
import {until} from "../lib/fixture.mjs";

// In the order of the navigation.
export const VIEWS = [
    {name: "Overview", path: "/overview"},
    {name: "Domains", path: "/domains"},
    {name: "Users", path: "/users"},
    {name: "Groups", path: "/groups"},
    {name: "Options", path: "/options"},
    {name: "Schedule", path: "/schedule"},
    {name: "Events", path: "/events"},
];

// Some place shows this text now or soon.
export const expectText = (place, text, ms) =>
    place.getByText(text).filter({visible: true}).first().waitFor({state: "visible", timeout: ms});

export const expectGone = (locator, ms) => locator.first().waitFor({state: "hidden", timeout: ms});

// The element holds the keyboard's focus now or soon.
export const expectFocus = (locator) =>
    until(`the focus on ${locator}`, () => locator.evaluate((element) => element === document.activeElement));

// The alert of an error: what it means, its cause, what to try, its code, word for word as the catalogue has it.
export async function expectError(page, code, ms) {
    const {meaning, cause, action} = errorOf(code);
    const alert = page.getByRole("alert").filter({hasText: `Code ${code}`});
    await alert.first().waitFor({timeout: ms});
    for (const text of [meaning, cause, action]) {
        await expectText(alert, text);
    }
}
