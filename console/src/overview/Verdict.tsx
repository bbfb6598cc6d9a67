import CheckCircleIcon from '@patternfly/react-icons/dist/esm/icons/check-circle-icon';
import ExclamationCircleIcon from '@patternfly/react-icons/dist/esm/icons/exclamation-circle-icon';
import QuestionCircleIcon from '@patternfly/react-icons/dist/esm/icons/question-circle-icon';

const icons = { good: CheckCircleIcon, bad: ExclamationCircleIcon, unknown: QuestionCircleIcon };

// A state in one line, told by words and by a symbol.
export function Verdict({ kind, text }: { kind: keyof typeof icons; text: string }) {
  const Icon = icons[kind];
  return (
    <p className={`vorn-verdict vorn-verdict--${kind}`}>
      <Icon aria-hidden="true" />
      <span>{text}</span>
    </p>
  );
}
