// What src/tools/twctl/report/page.js uses of the chart libraries. scripts/vendor-charts bundles it.
export { plot, axisX, axisY, barX, barY, cell, dot, gridX, gridY, line, rect, rectX, rectY, ruleX, ruleY, text, tickX } from "@observablehq/plot";
export { zoom, zoomIdentity } from "d3-zoom";
export { select } from "d3-selection";
