export const answer: number = 42; // in TypeScript
