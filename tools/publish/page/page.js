"use strict";

const renewal = 350;      // milliseconds between the renewals of a movement, which the camera ends after 1000
const commandTime = 2500; // milliseconds that a command may take
const pictureTime = 8000;
const stateTime = 1000;

const me = Array.from(crypto.getRandomValues(new Uint8Array(12)), (byte) => byte.toString(16).padStart(2, "0")).join("");
// A page that was opened with a login in its address may ask for nothing at addresses relative to that.
const at = (name) => location.origin + location.pathname + name;
const element = (id) => document.getElementById(id);

// A signal that ends what takes longer; browsers before 2022 have none that does so by itself.
function within(time) {
    if (AbortSignal.timeout) {
        return AbortSignal.timeout(time);
    }
    const ending = new AbortController();
    setTimeout(() => ending.abort(), time);
    return ending.signal;
}

// Left alone where nothing changes, so that a screen reader does not say it every second.
function say(id, text) {
    if (element(id).textContent !== text) {
        element(id).textContent = text;
    }
}

// --- Commands: one under way at a time and numbered, so that none overtakes another. -------------------------------

// Starts where no earlier life of the page can have been.
let order = Date.now() * 1000;
let underWay = false;
const waiting = [];        // commands that are sent as they are
let wanted = {pan: 0, tilt: 0, zoom: 0};
let told = {turn: false, zoom: false}; // what the camera was told to do and not yet to stop
let renewed = 0;

function post(command, last) {
    order += 1;
    return fetch(at("command"), {
        method: "POST",
        headers: {"Content-Type": "application/json"},
        body: JSON.stringify({...command, page: me, order}),
        keepalive: Boolean(last),
        signal: last ? undefined : within(commandTime),
    });
}

function turning() {
    return wanted.pan !== 0 || wanted.tilt !== 0;
}

// What there is to send now: first a stop, then what was pressed, then movements as often as they need it.
function nextCommand() {
    const stop = {turn: told.turn && !turning(), zoom: told.zoom && wanted.zoom === 0};
    if (stop.turn || stop.zoom) {
        told = {turn: told.turn && !stop.turn, zoom: told.zoom && !stop.zoom};
        return {command: "stop", ...stop};
    }
    if (waiting.length > 0) {
        return waiting.shift();
    }
    if ((turning() || wanted.zoom !== 0) && performance.now() - renewed >= renewal) {
        renewed = performance.now();
        const move = {command: "move"};
        if (turning()) {
            Object.assign(move, {pan: wanted.pan, tilt: wanted.tilt});
            told.turn = true;
        }
        if (wanted.zoom !== 0) {
            move.zoom = wanted.zoom;
            told.zoom = true;
        }
        return move;
    }
    return null;
}

async function send() {
    if (underWay) {
        return;
    }
    underWay = true;
    for (let command = nextCommand(); command !== null; command = nextCommand()) {
        try {
            const answer = await post(command);
            if (command.command === "recall" && answer.status === 400) {
                hint("Preset " + command.preset + " holds nothing yet");
            }
        } catch (problem) {
            // Not sent again: the camera stops by itself, and a movement that is still held is renewed.
            if (command.command === "stop" && live) {
                told = {turn: told.turn || command.turn, zoom: told.zoom || command.zoom};
            }
            break;
        }
    }
    underWay = false;
}

function want(change) {
    wanted = {...wanted, ...change};
    renewed = 0;
    send();
}

function ask(command) {
    if (waiting.length < 8) {
        waiting.push(command);
    }
    send();
}

setInterval(send, 100);

// --- Holding: with mouse, finger, pen and keys. ---------------------------------------------------------------------

const held = new Map(); // what is held, with the movement that it means

function sum() {
    const clamp = (value) => Math.max(-1, Math.min(1, value));
    const all = {pan: 0, tilt: 0, zoom: 0};
    for (const movement of held.values()) {
        all.pan += movement.pan || 0;
        all.tilt += movement.tilt || 0;
        all.zoom += movement.zoom || 0;
    }
    return {pan: clamp(all.pan), tilt: clamp(all.tilt), zoom: clamp(all.zoom)};
}

function hold(key, movement, button) {
    if (!held.has(key)) {
        held.set(key, {...movement, button});
        button?.classList.add("held");
        want(sum());
    }
}

function release(key) {
    const movement = held.get(key);
    if (movement && held.delete(key)) {
        movement.button?.classList.remove("held");
        want(sum());
    }
}

// Also says so where the page is going away and cannot wait for its turn.
function releaseAll() {
    const moving = told.turn || told.zoom;
    for (const key of [...held.keys()]) {
        held.get(key).button?.classList.remove("held");
        held.delete(key);
    }
    wanted = {pan: 0, tilt: 0, zoom: 0};
    if (moving) {
        post({command: "stop", turn: true, zoom: true}, true).catch(() => {});
        send();
    }
}

for (const button of document.querySelectorAll("[data-pan], [data-zoom]")) {
    const movement = {
        pan: Number(button.dataset.pan || 0),
        tilt: Number(button.dataset.tilt || 0),
        zoom: Number(button.dataset.zoom || 0),
    };
    button.addEventListener("pointerdown", (event) => {
        if (event.button === 0) {
            // Without the capture that touch brings, so that leaving the button is seen.
            if (button.hasPointerCapture(event.pointerId)) {
                button.releasePointerCapture(event.pointerId);
            }
            hold("pointer " + event.pointerId, movement, button);
        }
    });
    button.addEventListener("pointerleave", (event) => release("pointer " + event.pointerId));
    button.addEventListener("contextmenu", (event) => event.preventDefault());
    button.addEventListener("keydown", (event) => {
        if (event.key === " " || event.key === "Enter") {
            event.preventDefault();
            hold("key " + event.code, movement, button);
        }
    });
    button.addEventListener("blur", () => {
        for (const [key, value] of [...held]) {
            if (value.button === button && key.startsWith("key ")) {
                release(key);
            }
        }
    });
}
for (const over of ["pointerup", "pointercancel"]) {
    window.addEventListener(over, (event) => release("pointer " + event.pointerId), true);
}

const keys = {
    ArrowLeft: {pan: -1},
    ArrowRight: {pan: 1},
    ArrowUp: {tilt: 1},
    ArrowDown: {tilt: -1},
    "+": {zoom: 1},
    "=": {zoom: 1},
    "-": {zoom: -1},
};

function buttonFor(movement) {
    return [...document.querySelectorAll("[data-pan], [data-zoom]")].find((button) =>
        Object.entries(movement).every(([axis, value]) => Number(button.dataset[axis]) === value));
}

document.addEventListener("keydown", (event) => {
    if (event.ctrlKey || event.altKey || event.metaKey || event.defaultPrevented) {
        return;
    }
    const movement = keys[event.key];
    const slides = event.target === element("focus") && event.key.startsWith("Arrow");
    if (movement && !slides) {
        event.preventDefault();
        hold("key " + event.code, movement, buttonFor(movement));
    } else if (!event.repeat && /^[1-9]$/.test(event.key)) {
        preset(Number(event.key));
    } else if (!event.repeat && event.key.toLowerCase() === "s") {
        setStoring(!storing);
    } else if (event.key === "Escape") {
        setStoring(false);
    }
});
document.addEventListener("keyup", (event) => {
    release("key " + event.code);
    if (event.key === "Meta") {
        releaseAll(); // some systems report no other key's end while this one is down
    }
});

window.addEventListener("blur", releaseAll);
window.addEventListener("pagehide", releaseAll);
document.addEventListener("visibilitychange", () => {
    if (document.hidden) {
        releaseAll();
    } else {
        look();
    }
});

// --- Presets and focus. ---------------------------------------------------------------------------------------------

let storing = false;
let hintTimer = 0;

function hint(text) {
    element("hint").textContent = text;
    clearTimeout(hintTimer);
    hintTimer = setTimeout(() => setStoring(storing), 2500);
}

function setStoring(on) {
    storing = on;
    clearTimeout(hintTimer);
    element("store").setAttribute("aria-pressed", String(on));
    element("hint").textContent = on ? "Stores here under the next number" : "Recalls a position";
}

function preset(number) {
    const command = storing ? "store" : "recall";
    ask({command, preset: number});
    if (storing) {
        setStoring(false);
        hint("Stored as preset " + number);
    }
}

for (let number = 1; number <= 9; ++number) {
    const button = document.createElement("button");
    button.type = "button";
    button.textContent = String(number);
    button.setAttribute("aria-label", "Preset " + number);
    button.addEventListener("click", () => preset(number));
    element("presets").append(button);
}
element("store").addEventListener("click", () => setStoring(!storing));

// The slider goes from far to near, as on a panel; the camera counts from near to far.
const otherWay = (focus) => Math.round((1 - focus) * 100) / 100;

let focusTouched = 0;
element("focus").addEventListener("input", () => {
    focusTouched = performance.now();
    element("automatic").checked = false;
    // Only the newest place counts.
    const earlier = waiting.findIndex((command) => command.command === "focus");
    if (earlier >= 0) {
        waiting.splice(earlier, 1);
    }
    ask({command: "focus", value: otherWay(element("focus").value)});
});
element("automatic").addEventListener("change", () => {
    focusTouched = performance.now();
    ask({command: "automaticFocus", on: element("automatic").checked});
});

// --- What is seen: the picture, the state. --------------------------------------------------------------------------

let live = false;
let looking = false;
let shown = 0;

function setLive(on) {
    live = on;
    if (!on) {
        say("state", "No connection");
        element("state").className = "lost";
    }
    element("notice").hidden = on;
    element("notice").textContent = on ? "" : "The connection is broken. Trying again.";
    if (!on) {
        releaseAll();
    }
}

const pause = (time) => new Promise((done) => setTimeout(done, time));

async function draw(answer) {
    const picture = await createImageBitmap(await answer.blob());
    const canvas = element("picture");
    if (canvas.width !== picture.width || canvas.height !== picture.height) {
        canvas.width = picture.width;
        canvas.height = picture.height;
    }
    canvas.getContext("2d").drawImage(picture, 0, 0);
    picture.close();
}

// Each picture is asked for when the one before it is drawn: a slow network shows fewer, never old ones.
async function look() {
    if (looking) {
        return;
    }
    looking = true;
    while (!document.hidden) {
        try {
            const answer = await fetch(at("picture.jpg?page=" + me + "&after=" + shown),
                {signal: within(pictureTime)});
            if (!answer.ok) {
                throw new Error("no picture");
            }
            shown = answer.headers.get("X-Picture");
            await draw(answer);
            if (!live) {
                setLive(true);
                update();
            }
        } catch (problem) {
            setLive(false);
            await pause(1000);
        }
    }
    looking = false;
}

function show(state) {
    const doing = [state.turning && "turning", state.zooming && "zooming", state.focusing && "focusing"].filter(Boolean);
    say("state", doing.length > 0 ? "Live, " + doing.join(" and ") : "Live");
    element("state").className = "live";
    say("viewers", state.viewers === 1 ? "1 viewer" : state.viewers + " viewers");
    [...element("presets").children].forEach((button, index) => {
        const kept = state.presets.includes(index + 1);
        button.classList.toggle("kept", kept);
        button.title = kept ? "Holds a position" : "Empty";
    });
    if (performance.now() - focusTouched > 1500) {
        element("focus").value = otherWay(state.focus);
        element("automatic").checked = state.automaticFocus;
    }
}

async function update() {
    if (document.hidden) {
        return;
    }
    try {
        const answer = await fetch(at("state"), {signal: within(commandTime)});
        if (answer.ok) {
            const state = await answer.json();
            if (live) {
                show(state);
            }
        }
    } catch (problem) {
        // The picture tells of a broken connection.
    }
}

setInterval(update, stateTime);
look();
