// The page of `qntrace report`: puts its parts to work.
import { startDetails } from "./details.js";
import { startErrors } from "./errors.js";
import { startRates } from "./rates.js";
import { startSummary } from "./summary.js";
import { startTimeline } from "./timeline.js";

startSummary();
startRates();
startTimeline();
startDetails();
startErrors();
